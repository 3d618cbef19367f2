"""The command ./run: builds the virtual rescue device, boots it and runs a story on it."""

from __future__ import annotations

import argparse
import signal
import sys
import time

from device import disk_kinds, vm
from scripts import building

DEFAULT_STORY = "unlock_metadata"
CONSOLE_DISK = "fbe_metadata_password"
STORY_TIMEOUT_SECONDS = 240


def parse_arguments() -> argparse.Namespace:
    parser = argparse.ArgumentParser(
        prog="./run",
        description="Builds the virtual rescue device (aarch64, emulated), boots it, and shows a "
        "story on it step by step, with the time that each step took. On a Debian 12 machine it "
        "installs the packages that are missing, for which it needs root or sudo.",
        epilog="Exit status: 0 when the story went as it should, 1 when it did not, 2 for a wrong "
        "command line.",
    )
    choice = parser.add_mutually_exclusive_group()
    choice.add_argument("--list", action="store_true", help="list the stories")
    choice.add_argument("--story", default=DEFAULT_STORY, help="the story to run (%(default)s)")
    choice.add_argument(
        "--shell",
        action="store_true",
        help="a shell on the device instead; `exit` powers it off, Ctrl-A X ends it at once",
    )
    return parser.parse_args()


def list_stories() -> int:
    width = max(len(story.name) for story in vm.stories())
    for story in vm.stories():
        print(f"{story.name:<{width}} {story.description}")
    return 0


def find_story(name: str) -> vm.Story:
    for story in vm.stories():
        if story.name == name:
            return story
    print(f"there is no story {name}; ./run --list shows them", file=sys.stderr)
    sys.exit(2)


def run_story(story: vm.Story, new_device: vm.Device) -> int:
    print(f"\n{story.description}\n", flush=True)
    with new_device as device:
        outcome = device.run_story(
            story.path, STORY_TIMEOUT_SECONDS, lambda text: print(text, end="", flush=True)
        )
        device.keep_logs(building.BUILD / "logs" / story.name)
    print()
    for moment, seconds in outcome.moments.items():
        print(f"from power-on to {moment}: {seconds:.1f} s")
    print(f"from power-on to power-off: {outcome.seconds:.1f} s")
    print(f"logs: build/logs/{story.name}")
    if outcome.problem:
        print(outcome.problem, file=sys.stderr)
    return 0 if outcome.status == 0 else 1


def run_shell(new_device: vm.Device) -> int:
    print(f"\nthe device's console, with the disk {CONSOLE_DISK}; `exit` powers it off\n", flush=True)
    with new_device as device:
        return device.run_console()


def main() -> int:
    arguments = parse_arguments()
    if arguments.list:
        return list_stories()
    story = find_story(arguments.story)
    started = time.monotonic()
    try:
        building.install_packages("run")
        with building.build_lock():
            building.build_image()
            building.build_preset("device", "initramfs")
            device = (
                disk_kinds.device_with(CONSOLE_DISK)
                if arguments.shell
                else disk_kinds.device_for(story.path)
            )
    except (building.StepFailed, disk_kinds.ProvisioningFailed) as failure:
        print(failure, file=sys.stderr)
        return 1
    print(f"ready after {time.monotonic() - started:.1f} s", flush=True)
    return run_shell(device) if arguments.shell else run_story(story, device)


if __name__ == "__main__":
    # An ordinary end, so that the device is stopped and its folders are removed.
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(128 + signal.SIGTERM))
    sys.exit(main())
