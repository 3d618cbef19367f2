"""What the host does for a story while it runs, on the story's request.

A story asks with a file /share/requests/NAME, which may hold an argument (see stories/lib/host.sh).
The host carries the request out and then removes the file; where it cannot, it renames it to
NAME.failed, with the reason in it.
"""

from __future__ import annotations

import os
from collections.abc import Callable, Iterator, Mapping
from pathlib import Path
from typing import BinaryIO

Action = Callable[[str], object]

SECTOR_BYTES = 512


def serve(requests: Path, actions: Mapping[str, Action]) -> None:
    """Carries out the requests that are waiting in the folder `requests`."""
    for request in sorted(requests.iterdir()):
        if request.suffix == ".failed":
            continue
        try:
            if request.name not in actions:
                raise ValueError(f"there is no request {request.name}")
            actions[request.name](request.read_text())
            request.unlink()
        except (OSError, RuntimeError, ValueError) as error:
            request.write_text(f"{error}\n")
            request.rename(f"{request}.failed")


def find_on_disk(disk: Path, partition: str, needle: bytes) -> None:
    """Raises ValueError when the partition does not hold these bytes, side by side.

    `partition` is the first sector and the number of sectors, as the kernel tells them.
    """
    first, count = (int(number) for number in partition.split())
    if not needle:
        raise ValueError("nothing to look for")
    with disk.open("rb") as file:
        pieces = written_pieces(file, first * SECTOR_BYTES, (first + count) * SECTOR_BYTES)
        if not any(needle in piece for piece in pieces):
            raise ValueError("not on the disk")


def written_pieces(file: BinaryIO, begin: int, end: int) -> Iterator[bytes]:
    """What was ever written of a sparse file between these offsets: its pieces, without the holes."""
    while begin < end:
        try:
            begin = os.lseek(file.fileno(), begin, os.SEEK_DATA)
        except OSError:  # nothing but a hole follows
            return
        piece_end = min(os.lseek(file.fileno(), begin, os.SEEK_HOLE), end)
        yield os.pread(file.fileno(), max(0, piece_end - begin), begin)
        begin = piece_end
