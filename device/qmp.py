"""Commands to a running QEMU over its machine protocol."""

from __future__ import annotations

import json
import socket
from pathlib import Path


def execute(path: Path, command: str, **arguments: object) -> object:
    """Carries out a command at the socket `path`; raises RuntimeError when QEMU refuses it, OSError
    when there is no QEMU."""
    with socket.socket(socket.AF_UNIX) as connection:
        connection.settimeout(5)
        connection.connect(str(path))
        with connection.makefile("rw") as stream:
            stream.readline()  # the greeting
            for name, words in (("qmp_capabilities", {}), (command, arguments)):
                stream.write(json.dumps({"execute": name, "arguments": words}) + "\n")
                stream.flush()
                answer = json.loads(stream.readline())
                while "event" in answer:
                    answer = json.loads(stream.readline())
                if "error" in answer:
                    raise RuntimeError(f"{name}: {answer['error']['desc']}")
    return answer["return"]
