"""Short runs of the fuzz targets; fuzz/README.md tells of the long ones."""

from __future__ import annotations

import os
import re
import subprocess
import tempfile
from pathlib import Path

from scripts.building import BUILD, ROOT, build_preset
from scripts.programs import SANITIZER_ENVIRONMENT, test_programs
from scripts.tally import Tally, describe_status

SECONDS = 3
# Also for an input that hangs, which libFuzzer itself only notices after a minute by default.
TIMEOUT_SECONDS = 60
SHOWN_LINES = 40
DONE = re.compile(r"^Done (\d+) runs in ", re.MULTILINE)


def run_target(program: Path, samples: Path, artifacts: Path, seconds: int = SECONDS) -> Tally:
    """Runs all samples and then what libFuzzer makes of them. Counts one check; an input that fails
    is kept in `artifacts`."""
    with tempfile.TemporaryDirectory(prefix="fuzz-") as found:
        try:
            result = subprocess.run(
                [str(program), f"-max_total_time={seconds}", "-timeout=20",
                 f"-artifact_prefix={artifacts}/{program.name}-", found, str(samples)],
                stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                text=True, errors="replace", timeout=TIMEOUT_SECONDS, check=False,
                env={**os.environ, **SANITIZER_ENVIRONMENT})
            how, output, ended = describe_status(result.returncode), result.stdout, True
        except subprocess.TimeoutExpired:
            how, output, ended = "did not end", "", False
    done = DONE.search(output)
    sample_count = len(list(samples.iterdir()))
    enough = done is not None and int(done[1]) > sample_count > 0
    tally = Tally()
    tail = "".join(f"\n    {line}" for line in output.splitlines()[-SHOWN_LINES:])
    tally.add_check(f"fuzz/{program.name}: {how}{tail}",
                    ended and result.returncode == 0 and enough)
    if done is not None:
        print(f"fuzz {program.name}: {sample_count} samples, {done[1]} runs", flush=True)
    return tally


def run_fuzz() -> Tally:
    build_preset("fuzz", "fuzz_targets")
    artifacts = BUILD / "logs/fuzz"
    artifacts.mkdir(parents=True, exist_ok=True)
    tally = Tally()
    programs = test_programs(BUILD / "fuzz/targets")
    if not programs:
        tally.add_failure("fuzz: there are no targets")
    for program in programs:
        tally.add(run_target(program, ROOT / "fuzz/corpus" / program.name, artifacts))
    return tally
