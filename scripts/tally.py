"""Counting test results: what GoogleTest programs report, and what they do not live to report."""

from __future__ import annotations

import json
from dataclasses import dataclass, field
from pathlib import Path

LOG_TAIL_LINES = 40
REASON_LINES = 20


@dataclass
class Tally:
    passed: int = 0
    failed: int = 0
    skipped: int = 0
    failures: list[str] = field(default_factory=list)

    def add(self, other: Tally) -> None:
        self.passed += other.passed
        self.failed += other.failed
        self.skipped += other.skipped
        self.failures += other.failures

    def add_failure(self, what: str) -> None:
        self.failed += 1
        self.failures.append(what)

    def add_check(self, what: str, ok: bool) -> None:
        if ok:
            self.passed += 1
        else:
            self.add_failure(what)

    def last_line(self) -> str:
        line = f"{self.passed} passed, {self.failed} failed"
        return f"{line}, {self.skipped} skipped" if self.skipped else line


def describe_status(status: int) -> str:
    """An exit status in words; negative or from 129 on, it stands for a signal."""
    if status < 0 or status > 128:
        return f"killed by signal {-status if status < 0 else status - 128}"
    return f"exit status {status}"


def count_program(name: str, status: int | None, report: Path, log: Path) -> Tally:
    """Counts one GoogleTest program.

    `status` is its exit status, None where it did not end by itself or was never run; `report` its
    JSON report and `log` its output, either of which may be missing. A program that crashed, left
    no usable report, ran no test, or ended otherwise than its report says is one more failure, with
    the end of its log.
    """
    tally = Tally()
    try:
        cases = [case for suite in json.loads(report.read_text())["testsuites"]
                 for case in suite["testsuite"]]
        for case in cases:
            _count_case(tally, name, case)
    except (OSError, ValueError, KeyError, TypeError):
        cases = []

    how = "did not end" if status is None else describe_status(status)
    if not cases:
        tally.add_failure(f"{name}: no report ({how}){_tail(log)}")
    elif status != (1 if tally.failed else 0):
        tally.add_failure(f"{name}: {how} does not fit its report{_tail(log)}")
    return tally


def _count_case(tally: Tally, program: str, case: dict[str, object]) -> None:
    if case.get("failures"):
        tally.add_failure(f"{program}: {case['classname']}.{case['name']}\n{_reasons(case)}")
    elif case["result"] == "COMPLETED":
        tally.passed += 1
    else:
        tally.skipped += 1


def _reasons(case: dict[str, object]) -> str:
    failures = case["failures"]
    assert isinstance(failures, list)
    lines = [line for failure in failures for line in failure["failure"].splitlines()]
    more = ["..."] if len(lines) > REASON_LINES else []
    return "\n".join("    " + line for line in lines[:REASON_LINES] + more)


def _tail(log: Path) -> str:
    try:
        lines = log.read_text(errors="replace").splitlines()[-LOG_TAIL_LINES:]
    except OSError:
        return ""
    return "".join("\n    " + line for line in lines)
