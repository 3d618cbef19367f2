"""Starts the virtual rescue device under QEMU and collects what it leaves behind.

The host and the device share a temporary folder, /share on the device. The host puts the story
there; the device's init leaves the output, the logs and, last of all, the result (see
init/init.cpp). A run without a result has failed, whatever QEMU says: a kernel that panics ends
QEMU with status 0. A story that ends the device itself says so in its head: a line
"# ends: REQUEST" with the "sys.powerctl" request that is to end the run.

Each run has a copy of its disk to itself. A story may have the power cut (see
stories/power_cuts.story): the device then starts again on the same disk and runs the story from its
beginning. /share/boot holds the number of the start, from 1.
"""

from __future__ import annotations

import dataclasses
import re
import shutil
import subprocess
import tempfile
import time
from collections.abc import Callable, Iterable
from dataclasses import dataclass, field
from pathlib import Path

from device import host_requests, qmp, removable_media

ROOT = Path(__file__).resolve().parent.parent
IMAGE = ROOT / "build/image"
DEVICE_BUILD = ROOT / "build/device"
INITRAMFS = DEVICE_BUILD / "device/initramfs"
EMPTY_DISK = IMAGE / "disk/disk.img"
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


def copy_disk(source: Path, target: Path) -> None:
    """Copies a disk's image, without its holes."""
    copy = ["cp", "--sparse=always", "--reflink=auto", str(source), str(target)]
    subprocess.run(copy, check=True)


@dataclass
class Outcome:
    """How a run of the device ended."""

    status: int | None  # the story's exit status; None: the device left no result
    power_request: str | None  # the "sys.powerctl" request that ended the run
    problem: str  # why there is no result, in words; empty when there is one
    seconds: float  # from the first start of QEMU to its last end
    moments: dict[str, float]  # what the story noted, by name: seconds from QEMU's start
    log: str  # the story's output


def fit_to_end(outcome: Outcome, story_text: str) -> Outcome:
    """The outcome of a story as its head has it end: the right request is an exit status of 0."""
    wanted = re.search(r"^# ends: (.*)$", story_text, re.MULTILINE)
    if wanted is None or outcome.problem:
        return outcome
    request = outcome.power_request
    if request == wanted[1]:
        return dataclasses.replace(outcome, status=0)
    if request is None and outcome.status != 0:
        return outcome
    problem = f"the device ended with the request {request}, not {wanted[1]}"
    return dataclasses.replace(outcome, status=None, problem=problem)


@dataclass
class Device:
    """One run of the virtual device; a context manager, which ends QEMU and removes the folders."""

    kernel_arguments: list[str] = field(default_factory=list)
    base_disk: Path = EMPTY_DISK
    disk_facts: Path | None = None  # a folder that tells about the disk: /share/disk on the device

    def __enter__(self) -> Device:
        self._folder = Path(tempfile.mkdtemp(prefix="sentrova-device-"))
        self.share = self._folder / "share"
        self.disk = self._folder / "disk.img"
        self._requests = self.share / "requests"
        self._moments: dict[str, float] = {}
        for folder in (self._requests, self.share / "moments"):
            folder.mkdir(parents=True)
        self._media: list[str] = []
        self._boots = 0
        self._process: subprocess.Popen[bytes] | None = None
        return self

    def __exit__(self, *_: object) -> None:
        self._cut_power()
        shutil.rmtree(self._folder)

    def run_story(
        self, story: Path, timeout_seconds: float, on_output: Callable[[str], None] | None = None
    ) -> Outcome:
        """Boots, runs the story and waits for the end; `on_output` gets its output as it comes."""
        shutil.copy(story, self.share / "story")
        self._prepare_disk()
        self._prepare_media(removable_media.wanted_kinds(story.read_text()))
        for part in (STORIES / "lib").iterdir():
            shutil.copy(part, self.share)
        started = time.monotonic()
        self._boot()

        shown = 0
        timed_out = False
        running = True
        while running:
            running = self._is_running()
            self._note_moments()
            if on_output is not None:
                shown = self._show_new_output(shown, on_output)
            if running:
                host_requests.serve(self._requests, self._actions())
            if running and time.monotonic() - started > timeout_seconds:
                timed_out = True
                print(f"device: no end after {timeout_seconds} s; it is {self._machine_status()}")
                self._cut_power()
                running = False
            if running:
                time.sleep(POLL_SECONDS)
        outcome = self._outcome(time.monotonic() - started, timed_out)
        return fit_to_end(outcome, story.read_text())

    def run_console(self) -> int:
        """Boots with a shell on this terminal and waits for its end; returns its exit status."""
        self.kernel_arguments = [*self.kernel_arguments, "prop.ro.boot.console=1"]
        self._prepare_disk()
        self._prepare_media(removable_media.KINDS)
        self._start(["-serial", "mon:stdio"], interactive=True)
        assert self._process is not None
        self._process.wait()
        result = self._read("result")
        return int(result) if result is not None else 1

    def _boot(self) -> None:
        self._boots += 1
        (self.share / "boot").write_text(f"{self._boots}\n")
        self._boot_started = time.monotonic()
        self._start(["-serial", f"file:{self._folder}/console.txt"])

    def _is_running(self) -> bool:
        return self._process is not None and self._process.poll() is None

    def _cut_power(self) -> None:
        if self._process is not None and self._process.poll() is None:
            self._process.kill()
            self._process.wait()

    def _restart_after(self, milliseconds: str) -> None:
        time.sleep(int(milliseconds) / 1000)
        self._cut_power()
        self._boot()

    def _note_moments(self) -> None:
        for moment in (self.share / "moments").iterdir():
            self._moments.setdefault(moment.name, time.monotonic() - self._boot_started)

    def _actions(self) -> dict[str, host_requests.Action]:
        return {
            **removable_media.actions(self._folder, self._qmp),
            "cut_power": self._restart_after,
            "find_on_disk": lambda partition: host_requests.find_on_disk(
                self.disk, partition, (self.share / "needle").read_bytes()),
        }

    def _qmp(self, command: str, **arguments: object) -> object:
        return qmp.execute(self._folder / "qmp", command, **arguments)

    def _machine_status(self) -> str:
        """What QEMU says about the machine, as "running"."""
        try:
            status = self._qmp("query-status")
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
        command += ["-kernel", str(IMAGE / "kernel/vmlinuz"), "-initrd", str(INITRAMFS)]
        command += ["-dtb", str(IMAGE / "machine/device.dtb")]
        command += ["-append", " ".join([*KERNEL_ARGUMENTS, *self.kernel_arguments])]
        command += self._shared_folder("share", self.share, read_only=False)
        command += self._shared_folder("build", DEVICE_BUILD, read_only=True)
        # What the device has flushed is kept when QEMU is killed; this machine's own end is no case.
        command += ["-drive", f"file={self.disk},if=none,id=disk,format=raw,cache=unsafe"]
        command += ["-device", "virtio-blk-pci,drive=disk"]
        command += removable_media.qemu_arguments(self._folder, self._media)
        return command + ["-qmp", f"unix:{self._folder}/qmp,server=on,wait=off"]

    def _prepare_disk(self) -> None:
        copy_disk(self.base_disk, self.disk)
        if self.disk_facts is not None:
            shutil.copytree(self.disk_facts, self.share / "disk")

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

    def _outcome(self, seconds: float, timed_out: bool) -> Outcome:
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
        return Outcome(status, power_request, problem, seconds, self._moments, log)

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
