"""Running the test programs of a native preset on this machine."""

from __future__ import annotations

import os
import subprocess
from concurrent.futures import ThreadPoolExecutor
from pathlib import Path

from scripts.building import BUILD
from scripts.tally import Tally, count_program

PROGRAM_TIMEOUT_SECONDS = 300
SANITIZER_ENVIRONMENT = {
    "ASAN_OPTIONS": "detect_stack_use_after_return=1",
    "UBSAN_OPTIONS": "print_stacktrace=1",
}


def test_programs(folder: Path) -> list[Path]:
    """The programs in a folder of test programs; none where there is no such folder."""
    if not folder.is_dir():
        return []
    return sorted(path for path in folder.iterdir() if path.is_file() and os.access(path, os.X_OK))


def run_program(program: Path, reports: Path) -> Tally:
    report, log = reports / f"{program.name}.json", reports / f"{program.name}.log"
    report.unlink(missing_ok=True)
    status: int | None
    with log.open("wb") as output:
        try:
            status = subprocess.run(
                [str(program), f"--gtest_output=json:{report}"],
                stdin=subprocess.DEVNULL,
                stdout=output,
                stderr=subprocess.STDOUT,
                env={**os.environ, **SANITIZER_ENVIRONMENT},
                timeout=PROGRAM_TIMEOUT_SECONDS,
                check=False,
            ).returncode
        except subprocess.TimeoutExpired:
            status = None
    return count_program(f"{reports.name}/{program.name}", status, report, log)


def run_preset(preset: str) -> Tally:
    """Runs all test programs of a preset, as many at a time as there are processors."""
    programs = test_programs(BUILD / preset / "tests")
    reports = BUILD / "logs" / preset
    reports.mkdir(parents=True, exist_ok=True)
    tally = Tally()
    if not programs:
        tally.add_failure(f"{preset}: there are no test programs")
    with ThreadPoolExecutor(os.cpu_count()) as pool:
        for result in pool.map(lambda program: run_program(program, reports), programs):
            tally.add(result)
    return tally
