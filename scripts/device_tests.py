"""Running the cross-built test programs and the stories on the virtual device."""

from __future__ import annotations

import re

from device import disk_kinds, vm
from scripts.building import BUILD
from scripts.programs import test_programs
from scripts.tally import Tally, count_program, describe_status

PROGRAMS_TIMEOUT_SECONDS = 600
STORY_TIMEOUT_SECONDS = 240
# The tests of file labels need a security module that takes their policy.
PROGRAMS_KERNEL_ARGUMENTS = ["security=selinux", "selinux=1"]
# From power-on. The first answer takes some 4 s; the bound allows for a machine that is busy with
# something else.
MOMENT_LIMITS_SECONDS = {"first answered call": 30, "data readable": 12}

COUNTS = re.compile(r"(\d+) passed, (\d+) failed")


def run_programs() -> Tally:
    """Runs all test programs on the device, in one boot."""
    tally = Tally()
    programs = [
        f"{folder}/{program.name}"
        for folder in ("tests", "device_tests")
        for program in test_programs(vm.DEVICE_BUILD / folder)
    ]
    if not programs:
        tally.add_failure("device: there are no test programs")
        return tally
    reports = BUILD / "logs/device"
    with vm.Device(kernel_arguments=PROGRAMS_KERNEL_ARGUMENTS) as device:
        (device.share / "reports").mkdir()
        (device.share / "programs").write_text("".join(f"{name}\n" for name in programs))
        outcome = device.run_story(vm.STORIES / "lib/programs.sh", PROGRAMS_TIMEOUT_SECONDS)
        device.keep_logs(reports)
    for name in programs:
        base = reports / "reports" / name.replace("/", "-")
        status_file = base.with_suffix(".status")
        status = int(status_file.read_text()) if status_file.exists() else None
        report, log = base.with_suffix(".json"), base.with_suffix(".log")
        tally.add(count_program(f"device/{name}", status, report, log))
    if outcome.status != 0:
        tally.add_failure(f"device: the test programs' run did not end well {outcome.problem}")
    return tally


def count_story(name: str, outcome: vm.Outcome) -> Tally:
    """Counts a story's checks by its last line, which must fit the way it ended."""
    tally = Tally()
    lines = outcome.log.splitlines()
    counts = COUNTS.fullmatch(lines[-1]) if lines else None
    log = "".join(f"\n    {line}" for line in lines)
    if outcome.status is None or counts is None:
        how = outcome.problem or (
            "ended without its counts" if outcome.status is None
            else f"ended without its counts ({describe_status(outcome.status)})")
        tally.add_failure(f"story {name}: {how}{log}")
        return tally
    tally.passed, tally.failed = int(counts[1]), int(counts[2])
    if tally.failed:
        tally.failures.append(f"story {name}{log}")
    if outcome.status != (1 if tally.failed else 0):
        how = describe_status(outcome.status)
        tally.add_failure(f"story {name}: {how} does not fit its counts")
    elif tally.passed + tally.failed == 0:
        tally.add_failure(f"story {name}: it checked nothing")
    return tally


def run_story(story: vm.Story) -> Tally:
    try:
        new_device = disk_kinds.device_for(story.path)
    except disk_kinds.ProvisioningFailed as failure:
        tally = Tally()
        tally.add_failure(f"story {story.name}: {failure}")
        return tally
    with new_device as device:
        outcome = device.run_story(story.path, STORY_TIMEOUT_SECONDS)
        device.keep_logs(BUILD / "logs" / story.name)
    tally = count_story(story.name, outcome)
    timing = f"{outcome.seconds:.1f} s"
    for moment, seconds in outcome.moments.items():
        timing += f", {moment} after {seconds:.1f} s"
        limit = MOMENT_LIMITS_SECONDS[moment]
        tally.add_check(
            f"story {story.name}: {moment} only after {seconds:.1f} s, limit {limit} s",
            seconds <= limit,
        )
    print(f"story {story.name}: {timing}", flush=True)
    return tally


def run_stories() -> Tally:
    tally = Tally()
    for story in vm.stories():
        tally.add(run_story(story))
    return tally
