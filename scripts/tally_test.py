import json
import tempfile
import unittest
from pathlib import Path

from scripts.tally import Tally, count_program


def case(name: str, result: str = "COMPLETED", **more: object) -> dict[str, object]:
    return {"name": name, "classname": "Suite", "status": "RUN", "result": result, **more}


FAILED = case("Bad", failures=[{"failure": "x.cpp:1\nwrong"}])


class CountProgram(unittest.TestCase):
    def count(self, status: int | None, cases: list[dict[str, object]] | str | None) -> Tally:
        with tempfile.TemporaryDirectory() as folder:
            report, log = Path(folder) / "report.json", Path(folder) / "log"
            log.write_text("last words\n")
            if isinstance(cases, str):
                report.write_text(cases)
            elif cases is not None:
                report.write_text(json.dumps({"testsuites": [{"testsuite": cases}]}))
            return count_program("p", status, report, log)

    def test_counts(self) -> None:
        good, skipped = case("Good"), case("Later", "SKIPPED")
        for status, cases, expected in (
            (0, [good, good], (2, 0, 0)),
            (0, [good, skipped, case("Off", "SUPPRESSED")], (1, 0, 2)),
            (1, [good, FAILED], (1, 1, 0)),
        ):
            tally = self.count(status, cases)
            self.assertEqual((tally.passed, tally.failed, tally.skipped), expected)

    def test_what_a_report_does_not_tell_is_a_failure(self) -> None:
        for status, cases in (
            (-11, None),  # crashed
            (None, None),  # hung, or never run
            (0, None),  # left no report
            (0, "{"),
            (0, '{"testsuites": 3}'),
            (0, []),  # ran no test
            (-6, [case("Good")]),  # crashed after the report
            (137, [case("Good")]),
            (0, [FAILED]),  # failed, and says it did not
            (None, [case("Good")]),
        ):
            tally = self.count(status, cases)
            self.assertGreaterEqual(tally.failed, 1, (status, cases))
            self.assertIn("last words", tally.failures[-1])

    def test_last_line(self) -> None:
        self.assertEqual(Tally(3, 1).last_line(), "3 passed, 1 failed")
        self.assertEqual(Tally(3, 0, 2).last_line(), "3 passed, 0 failed, 2 skipped")
