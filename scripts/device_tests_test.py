import unittest

from device.vm import Outcome
from scripts.device_tests import count_story


class CountStory(unittest.TestCase):
    def test_families(self) -> None:
        for status, log, expected in (
            (0, "* step\n3 passed, 0 failed", (3, 0)),
            (1, "3 passed, 2 failed", (3, 2)),
            (0, "3 passed, 2 failed", (3, 3)),  # the status does not fit
            (1, "3 passed, 0 failed", (3, 1)),
            (0, "0 passed, 0 failed", (0, 1)),  # checked nothing
            (0, "", (0, 1)),
            (127, "sh: not found", (0, 1)),
            (None, "3 passed, 0 failed", (0, 1)),  # the device died
        ):
            outcome = Outcome(status, None, "", 1.0, {}, log)
            tally = count_story("s", outcome)
            self.assertEqual((tally.passed, tally.failed), expected, (status, log))
            self.assertEqual(bool(tally.failures), tally.failed > 0)
