"""The internal disks on which stories find the owner's data.

A story names its kind in a line of its own, `# disk: NAME`; without one it gets the empty disk.
Each kind is made once, on the device, by the script disks/NAME.disk, which is written like a story,
and kept until something that it is made from changes; a run works on a copy. What the script leaves
in /share/disk is what a story knows of its disk; init reads recovery.fstab there.
"""

from __future__ import annotations

import hashlib
import shutil
from collections.abc import Iterator
from pathlib import Path

from device import vm

SCRIPTS = vm.ROOT / "device/disks"
KEPT = vm.ROOT / "build/disks"
TIMEOUT_SECONDS = 120


class ProvisioningFailed(Exception):
    """A disk could not be made; the text is what its script printed and how it ended."""


def wanted_kind(story: str) -> str | None:
    """The disk that a story's text asks for; None: the empty one."""
    for line in story.splitlines():
        if line.startswith("# disk:"):
            return line.removeprefix("# disk:").strip()
    return None


def device_for(story: Path) -> vm.Device:
    """A device with the disk that the story asks for, made first if need be."""
    kind = wanted_kind(story.read_text())
    return vm.Device() if kind is None else device_with(kind)


def device_with(kind: str) -> vm.Device:
    """A device with a copy of this kind of disk, made first if need be; raises ProvisioningFailed."""
    script = SCRIPTS / f"{kind}.disk"
    if not script.exists():
        raise ProvisioningFailed(f"there is no kind of disk {kind}")
    kept, stamp = KEPT / kind, input_stamp(script)
    stamp_file = kept / "stamp"
    if not stamp_file.exists() or stamp_file.read_text() != stamp:
        shutil.rmtree(kept, ignore_errors=True)
        make(script, kept)
        stamp_file.write_text(stamp)
    return vm.Device(base_disk=kept / "disk.img", disk_facts=kept / "facts")


def make(script: Path, kept: Path) -> None:
    """Runs the script; leaves the disk and its facts in the new folder `kept`."""
    with vm.Device() as device:
        facts = device.share / "disk"
        facts.mkdir()
        outcome = device.run_story(script, TIMEOUT_SECONDS)
        if outcome.status != 0:
            raise ProvisioningFailed(f"{script.name}: {outcome.problem}\n{outcome.log}")
        kept.mkdir(parents=True)
        vm.copy_disk(device.disk, kept / "disk.img")
        shutil.copytree(facts, kept / "facts")
    print(f"disk {script.stem}: made in {outcome.seconds:.1f} s", flush=True)


def input_stamp(script: Path) -> str:
    """The hash of all that a disk is made from."""
    total = hashlib.sha256()
    for path in input_files(script):
        total.update(hashlib.sha256(path.read_bytes()).digest())
    return total.hexdigest()


def input_files(script: Path) -> Iterator[Path]:
    yield script
    yield from sorted((vm.STORIES / "lib").iterdir())
    # The image's components bear the hash of what they are made from.
    yield from (vm.IMAGE / component / ".stamp" for component in ("disk", "kernel", "machine"))
    yield vm.INITRAMFS
