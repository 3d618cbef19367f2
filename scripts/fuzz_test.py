import tempfile
import unittest
from pathlib import Path

from scripts.fuzz import run_target


class RunTarget(unittest.TestCase):
    def test_counts_only_a_run_that_went_beyond_its_samples(self) -> None:
        for script, passes in (
            ("echo 'Done 3 runs in 1 second(s)'", True),
            ("echo 'Done 2 runs in 1 second(s)'", False),
            ("echo 'Done 3 runs in 1 second(s)'; exit 77", False),
            ("echo 'SUMMARY: AddressSanitizer'; kill -ABRT $$", False),
            ("true", False),
        ):
            with self.subTest(script), tempfile.TemporaryDirectory() as name:
                folder = Path(name)
                program, samples = folder / "target", folder / "samples"
                program.write_text(f"#!/bin/sh\n{script}\n")
                program.chmod(0o755)
                samples.mkdir()
                for sample in ("good_a", "bad_b"):
                    (samples / sample).touch()
                tally = run_target(program, samples, folder)
                self.assertEqual((tally.passed, tally.failed), (int(passes), int(not passes)))
