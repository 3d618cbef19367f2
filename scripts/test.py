"""The command ./test: all checks and tests, and one line that counts them."""

from __future__ import annotations

import argparse
import signal
import sys
import time
import traceback
from collections.abc import Callable

from scripts import building, device_tests, fuzz, installation, lint, programs, script_tests
from scripts.tally import Tally


def build_and_run(preset: str) -> Tally:
    building.build_preset(preset)
    return programs.run_preset(preset)


def run_lint() -> Tally:
    # clang-tidy needs to know how files are compiled, and by clang.
    building.configure_preset("asan")
    return lint.run_lint()


def run_device() -> Tally:
    building.build_image()
    building.build_preset("device", "all", "initramfs")
    tally = device_tests.run_programs()
    tally.add(device_tests.run_stories())
    return tally


PARTS: dict[str, tuple[str, Callable[[], Tally]]] = {
    "scripts": ("tests of the project's own Python programs", script_tests.run_script_tests),
    "native": ("build with g++, unit tests", lambda: build_and_run("native")),
    "install": ("what is installed and packaged, built against and run", installation.run_installation),
    "asan": ("build with clang++ and sanitizers, unit tests", lambda: build_and_run("asan")),
    "device": ("cross build; unit tests, device tests and stories on the device", run_device),
    "fuzz": ("build with clang++ and libFuzzer, a few seconds of each fuzz target", fuzz.run_fuzz),
    "lint": ("clang-format and clang-tidy", run_lint),
}


def parse_arguments() -> argparse.Namespace:
    width = max(map(len, PARTS))
    parser = argparse.ArgumentParser(
        prog="./test",
        formatter_class=argparse.RawDescriptionHelpFormatter,
        description="Builds and tests everything, on this machine and on the virtual device. On a\n"
        "Debian 12 machine it installs the packages that are missing, for which it\n"
        "needs root or sudo. The last line counts what passed and failed.\n\nparts:\n"
        + "\n".join(f"  {name:<{width}}  {text}" for name, (text, _) in PARTS.items()),
        epilog="Exit status: 0 when nothing failed, 1 otherwise, 2 for a wrong command line.",
    )
    parser.add_argument("part", nargs="*", help="run only these parts (default: all)")
    arguments = parser.parse_args()
    unknown = set(arguments.part) - set(PARTS)
    if unknown:
        parser.error(f"there is no part {', '.join(sorted(unknown))}")
    return arguments


def run_part(name: str) -> Tally:
    print(f"== {name}: {PARTS[name][0]}", flush=True)
    started = time.monotonic()
    try:
        tally = PARTS[name][1]()
    except building.StepFailed as failure:
        tally = Tally()
        tally.add_failure(f"{name}: {failure}")
    except Exception:  # the other parts still run, and the last line still counts
        tally = Tally()
        tally.add_failure(f"{name}: {traceback.format_exc()}")
    for failure_text in tally.failures:
        print(f"FAILED {failure_text}", flush=True)
    print(f"== {name}: {tally.last_line()} ({time.monotonic() - started:.0f} s)", flush=True)
    return tally


def main() -> int:
    chosen = parse_arguments().part or list(PARTS)
    total = Tally()
    try:
        building.install_packages("run", "test")
        with building.build_lock():
            for name in PARTS:
                if name in chosen:
                    total.add(run_part(name))
    except building.StepFailed as failure:
        print(failure, file=sys.stderr)
        total.add_failure(str(failure))
    print(total.last_line())
    return 1 if total.failed else 0


if __name__ == "__main__":
    # An ordinary end, so that the device is stopped and its folders are removed.
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(128 + signal.SIGTERM))
    sys.exit(main())
