"""Starts the virtual rescue device under QEMU and collects what it leaves behind.

The host and the device share a temporary folder, /share on the device. The host puts the story
there; the device's init leaves the output, the logs and, last of all, the result (see
init/init.cpp). A run without a result has failed, whatever QEMU says: a kernel that panics ends
QEMU with status 0.
"""

from __future__ import annotations

import json
import shutil
import socket
import subprocess
import tempfile
import time
from collections.abc import Callable, Iterable
from dataclasses import dataclass, field
from pathlib import Path

from device import removable_media

ROOT = Path(__file__).resolve().parent.parent
IMAGE = ROOT / "build/image"
DEVICE_BUILD = ROOT / "build/device"
STORIES = ROOT / "device/stories"

KERNEL_ARGUMENTS = [
    "console=ttyAMA0",
    "panic=-1",
    "quiet",
    "cryptomgr.notests",  # the self-tests of the kernel's ciphers take most of a second
    "printk.devkmsg=on",  # none of init's log lines is dropped
]
POLL_SECONDS = 0.02


@dataclass
class Story:
    """A script that the device runs; its leading comment tells what it shows."""

    path: Path

    @property
    def name(self) -> str:
        return self.path.stem

    @property
    def description(self) -> str:
        for line in self.path.read_text().splitlines():
            if line.startswith("# "):
                return line[2:]
        return ""


def stories() -> list[Story]:
    return [Story(path) for path in sorted(STORIES.glob("*.story"))]


@dataclass
class Outcome:
    """How a run of the device ended."""

    status: int | None  # the story's exit status; None: the device left no result
    power_request: str | None  # the "sys.powerctl" request that ended the run
    problem: str  # why there is no result, in words; empty when there is one
    seconds: float  # from QEMU's start to its end
    first_answer_seconds: float | None  # from QEMU's start to the first answered transaction
    log: str  # the story's output


@dataclass
class Device:
    """One run of the virtual device; a context manager, which ends QEMU and removes the folders."""

    kernel_arguments: list[str] = field(default_factory=list)
    initramfs: Path = DEVICE_BUILD / "device/initramfs"

    def __enter__(self) -> Device:
        self._folder = Path(tempfile.mkdtemp(prefix="sentrova-device-"))
        self.share = self._folder / "share"
        self._requests = self.share / "requests"
        self._requests.mkdir(parents=True)
        self._media: list[str] = []
        self._process: subprocess.Popen[bytes] | None = None
        return self

    def __exit__(self, *_: object) -> None:
        if self._process is not None and self._process.poll() is None:
            self._process.kill()
            self._process.wait()
        shutil.rmtree(self._folder)

    def run_story(
        self, story: Path, timeout_seconds: float, on_output: Callable[[str], None] | None = None
    ) -> Outcome:
        """Boots, runs the story and waits for the end; `on_output` gets its output as it comes."""
        shutil.copy(story, self.share / "story")
        self._prepare_media(removable_media.wanted_kinds(story.read_text()))
        for part in (STORIES / "lib").iterdir():
            shutil.copy(part, self.share)
        started = time.monotonic()
        self._start(["-serial", f"file:{self._folder}/console.txt"])
        assert self._process is not None

        first_answer: float | None = None
        shown = 0
        timed_out = False
        running = True
        while running:
            running = self._process.poll() is None
            elapsed = time.monotonic() - started
            if first_answer is None and (self.share / "first_answer").exists():
                first_answer = elapsed
            if on_output is not None:
                shown = self._show_new_output(shown, on_output)
            if running:
                removable_media.serve_requests(self._requests, self._folder, self.qmp)
            if running and elapsed > timeout_seconds:
                timed_out = True
                print(f"device: no end after {timeout_seconds} s; it is {self.qmp_status()}")
                self._process.kill()
                self._process.wait()
                running = False
            if running:
                time.sleep(POLL_SECONDS)
        return self._outcome(time.monotonic() - started, first_answer, timed_out)

    def run_console(self) -> int:
        """Boots with a shell on this terminal and waits for its end; returns its exit status."""
        self.kernel_arguments = [*self.kernel_arguments, "prop.ro.boot.console=1"]
        self._prepare_media(removable_media.KINDS)
        self._start(["-serial", "mon:stdio"], interactive=True)
        assert self._process is not None
        self._process.wait()
        result = self._read("result")
        return int(result) if result is not None else 1

    def qmp(self, command: str, **arguments: object) -> object:
        """Carries out a command of QEMU's machine protocol; raises RuntimeError when it fails."""
        with socket.socket(socket.AF_UNIX) as connection:
            connection.settimeout(5)
            connection.connect(str(self._folder / "qmp"))
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

    def qmp_status(self) -> str:
        """What QEMU says about the machine, as "running"."""
        try:
            status = self.qmp("query-status")
        except (OSError, RuntimeError, ValueError) as error:
            return f"not to be asked ({error})"
        return str(status["status"]) if isinstance(status, dict) else "unknown"

    def _start(self, extra: list[str], interactive: bool = False) -> None:
        stdin = None if interactive else subprocess.DEVNULL
        # setpriv ends QEMU with this process, however this process ends.
        command = ["setpriv", "--pdeathsig", "KILL", *self._command(), *extra]
        with (self._folder / "qemu.txt").open("wb") as messages:
            output = None if interactive else messages
            self._process = subprocess.Popen(
                command, stdin=stdin, stdout=output, stderr=output, cwd=self._folder
            )

    def _command(self) -> list[str]:
        machine = [
            line
            for line in (ROOT / "device/image/machine.args").read_text().split("\n")
            if line and not line.startswith("#")
        ]
        command = ["qemu-system-aarch64", *machine]
        # One virtual processor: with more, wake-ups between them stall under emulation.
        command += ["-accel", "tcg,thread=multi", "-nodefaults", "-display", "none", "-no-reboot"]
        command += ["-kernel", str(IMAGE / "kernel/vmlinuz"), "-initrd", str(self.initramfs)]
        command += ["-dtb", str(IMAGE / "machine/device.dtb")]
        command += ["-append", " ".join([*KERNEL_ARGUMENTS, *self.kernel_arguments])]
        command += self._shared_folder("share", self.share, read_only=False)
        command += self._shared_folder("build", DEVICE_BUILD, read_only=True)
        # Writes go to a throw-away layer, so that no run sees another's.
        disk = IMAGE / "disk/disk.img"
        command += ["-drive", f"file={disk},if=none,id=disk,format=raw,snapshot=on"]
        command += ["-device", "virtio-blk-pci,drive=disk"]
        command += removable_media.qemu_arguments(self._folder, self._media)
        return command + ["-qmp", f"unix:{self._folder}/qmp,server=on,wait=off"]

    def _prepare_media(self, kinds: Iterable[str]) -> None:
        self._media = list(kinds)
        removable_media.make_disks(self._folder, self._media)

    @staticmethod
    def _shared_folder(tag: str, folder: Path, read_only: bool) -> list[str]:
        options = ",readonly=on" if read_only else ""
        return [
            "-fsdev",
            f"local,id={tag},path={folder},security_model=none{options}",
            "-device",
            f"virtio-9p-pci,fsdev={tag},mount_tag={tag}",
        ]

    def _read(self, name: str) -> str | None:
        try:
            return (self.share / name).read_text(errors="replace").strip()
        except FileNotFoundError:
            return None

    def _show_new_output(self, shown: int, on_output: Callable[[str], None]) -> int:
        try:
            with (self.share / "log.txt").open("rb") as log:
                log.seek(shown)
                new = log.read()
        except FileNotFoundError:
            return shown
        # Whole lines only, so that a character is never cut.
        new = new[: new.rfind(b"\n") + 1]
        if new:
            on_output(new.decode(errors="replace"))
        return shown + len(new)

    def _outcome(self, seconds: float, first_answer: float | None, timed_out: bool) -> Outcome:
        result, power_request = self._read("result"), self._read("powerctl")
        problem = ""
        if timed_out:
            problem = "the device did not end in time"
        elif result is None and power_request is None:
            problem = "the device left no result"
        if problem:
            problem += self._last_words()
        status = int(result) if result is not None and not timed_out else None
        log = self._read("log.txt") or ""
        return Outcome(status, power_request, problem, seconds, first_answer, log)

    def _last_words(self) -> str:
        """The ends of the console and of QEMU's messages, for a run that failed."""
        words = ""
        for name in ("console.txt", "qemu.txt"):
            path = self._folder / name
            text = path.read_text(errors="replace").strip() if path.exists() else ""
            if text:
                words += f"\n--- end of {name} ---\n" + "\n".join(text.splitlines()[-20:])
        return words

    def keep_logs(self, folder: Path) -> None:
        """Copies all that the device and QEMU wrote into `folder`, which is emptied first."""
        shutil.rmtree(folder, ignore_errors=True)
        shutil.copytree(self.share, folder)
        for name in ("console.txt", "qemu.txt"):
            if (self._folder / name).exists():
                shutil.copy(self._folder / name, folder)
