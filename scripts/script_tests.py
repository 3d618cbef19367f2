"""Running the tests of the project's own Python programs."""

from __future__ import annotations

import io
import unittest
from pathlib import Path

from scripts.building import ROOT
from scripts.tally import Tally


def run_script_tests() -> Tally:
    loader = unittest.TestLoader()
    suite = unittest.TestSuite(
        loader.loadTestsFromName(module_name(path))
        for folder in ("cli", "device", "scripts")
        for path in sorted((ROOT / folder).rglob("*_test.py"))
    )
    result = unittest.TextTestRunner(stream=io.StringIO()).run(suite)
    tally = Tally()
    for test, reason in result.failures + result.errors:
        tally.add_failure(f"{test}\n{reason}")
    tally.skipped = len(result.skipped)
    tally.passed = result.testsRun - tally.failed - tally.skipped
    if result.testsRun == 0:
        tally.add_failure("scripts: there are no tests")
    return tally


def module_name(path: Path) -> str:
    return ".".join(path.relative_to(ROOT).with_suffix("").parts)
