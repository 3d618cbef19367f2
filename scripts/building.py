"""Building the project's presets and the device's image, quietly: what a tool printed is shown only
when it failed."""

from __future__ import annotations

import fcntl
import os
import re
import subprocess
import time
from collections.abc import Iterator
from contextlib import contextmanager
from pathlib import Path

ROOT = Path(__file__).resolve().parent.parent
BUILD = ROOT / "build"


# What a tool says last is why it failed; a compiler's first error stands near its end.
SHOWN_LINES = 60


class StepFailed(Exception):
    """A tool failed; the text is the end of what it printed."""


def run_step(title: str, command: list[str], environment: dict[str, str] | None = None) -> None:
    """Runs a tool and prints the title with the time it took; raises StepFailed."""
    started = time.monotonic()
    result = subprocess.run(
        command,
        cwd=ROOT,
        env={**os.environ, **(environment or {})},
        stdin=subprocess.DEVNULL,
        stdout=subprocess.PIPE,
        stderr=subprocess.STDOUT,
        text=True,
        errors="replace",
        check=False,
    )
    print(f"{title}: {time.monotonic() - started:.1f} s", flush=True)
    if result.returncode != 0:
        # Lines of progress ("[3/98] Building ...") say nothing about it.
        lines = [line for line in result.stdout.splitlines() if not re.match(r"\[\d+/\d+\] ", line)]
        text = "\n".join(lines[-SHOWN_LINES:])
        raise StepFailed(f"{title} failed (status {result.returncode})\n{text}")


def install_packages(*lists: str) -> None:
    """Installs what is missing of scripts/packages/LIST.txt; raises StepFailed."""
    # Not quiet: it may ask for a password, and it may take a while.
    command = [str(ROOT / "scripts/install_packages"), *lists]
    if subprocess.run(command, check=False).returncode != 0:
        raise StepFailed("packages are missing")


@contextmanager
def build_lock() -> Iterator[None]:
    """Keeps a second ./run or ./test from building in the same folders at the same time."""
    BUILD.mkdir(exist_ok=True)
    with (BUILD / ".lock").open("w") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)
        yield


def configure_preset(preset: str) -> None:
    """Configures a preset where that has not been done; ninja does it again when it must."""
    if not (BUILD / preset / "build.ninja").exists():
        run_step(f"configure {preset}", ["cmake", "--preset", preset])


def build_preset(preset: str, *targets: str) -> None:
    """Builds the targets of a preset (all by default), configuring it first where need be."""
    folder = BUILD / preset
    configure_preset(preset)
    chosen = targets or ("all",)
    run_step(f"build {preset}", ["cmake", "--build", str(folder), "--target", *chosen])
    # What an earlier state of the sources built is not to be taken for a part of this one.
    subprocess.run(
        ["ninja", "-C", str(folder), "-t", "cleandead"], stdout=subprocess.DEVNULL, check=True
    )


def build_image() -> None:
    run_step("device image", [str(ROOT / "device/image/build")])
