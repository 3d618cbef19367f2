"""Checks of the sources: clang-format, and clang-tidy with a stamp for each file that passed."""

from __future__ import annotations

import hashlib
import json
import os
import re
import subprocess
from concurrent.futures import ThreadPoolExecutor
from functools import cache
from pathlib import Path

from scripts.building import BUILD, ROOT
from scripts.tally import Tally

STAMPS = BUILD / "tidy"
INCLUDE = re.compile(r'^\s*#\s*include\s+[<"]([^>"]+)[>"]', re.MULTILINE)
# Where the compiler looks for the project's own headers.
INCLUDE_FOLDERS = [ROOT, ROOT / "platform/include"]


def source_files() -> list[Path]:
    """The C++ files that are tracked or about to be."""
    listed = subprocess.run(
        ["git", "-c", "safe.directory=*", "ls-files", "-z", "--cached", "--others",
         "--exclude-standard", "*.h", "*.cpp"],
        cwd=ROOT, capture_output=True, text=True, check=True,
    ).stdout
    paths = [ROOT / name for name in sorted(set(listed.split("\0")) - {""})]
    return [path for path in paths if path.exists()]


def run_tool(command: list[str]) -> tuple[bool, str]:
    result = subprocess.run(command, cwd=ROOT, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                            stderr=subprocess.STDOUT, text=True, check=False)
    return result.returncode == 0, result.stdout


@cache
def included_files(path: Path) -> frozenset[Path]:
    """The project's headers that a file includes itself."""
    names = INCLUDE.findall(path.read_text(errors="replace"))
    return frozenset(
        file.resolve() for name in names for folder in [path.parent, *INCLUDE_FOLDERS]
        if (file := folder / name).is_file()
    )


def all_included_files(path: Path) -> set[Path]:
    found: set[Path] = set()
    waiting = [path]
    while waiting:
        file = waiting.pop()
        if file not in found:
            found.add(file)
            waiting += included_files(file)
    return found


def stamp_of(path: Path, compilation: dict[str, str]) -> str:
    """A hash of all that decides what clang-tidy says about a file."""
    digest = hashlib.sha256(compilation["command"].encode())
    digest.update((ROOT / ".clang-tidy").read_bytes())
    for file in sorted(all_included_files(path)):
        digest.update(str(file).encode() + file.read_bytes())
    return digest.hexdigest()


def compilations(preset: str) -> dict[Path, dict[str, str]]:
    """How each source file is compiled in a preset; empty where it has not been configured."""
    database = BUILD / preset / "compile_commands.json"
    if not database.exists():
        return {}
    return {Path(entry["file"]).resolve(): entry for entry in json.loads(database.read_text())}


def tidy(path: Path, preset: str, compilation: dict[str, str]) -> str:
    """What clang-tidy has against a file; empty when it passes."""
    stamp_file = STAMPS / path.relative_to(ROOT).with_suffix(".stamp")
    stamp = stamp_of(path, compilation)
    if stamp_file.exists() and stamp_file.read_text() == stamp:
        return ""
    ok, output = run_tool(["clang-tidy", "--quiet", "-p", str(BUILD / preset), str(path)])
    if not ok:
        return output or "clang-tidy failed"
    stamp_file.parent.mkdir(parents=True, exist_ok=True)
    stamp_file.write_text(stamp)
    return ""


def is_test(path: Path) -> bool:
    """Tests are left to the compilers' warnings: clang-tidy takes 5 s of processor time a file."""
    return path.name.endswith("_test.cpp") or path.is_relative_to(ROOT / "tests")


def run_lint() -> Tally:
    """Counts one check for the format of all files and one for each file that clang-tidy sees."""
    tally = Tally()
    files = source_files()
    ok, output = run_tool(["clang-format", "--dry-run", "-Werror", *map(str, files)])
    tally.add_check(f"format\n{output}", ok)

    # What only the device's preset compiles serves its tests.
    clang = compilations("asan")
    jobs = [(path, "asan", clang[path]) for path in files if path in clang and not is_test(path)]
    with ThreadPoolExecutor(os.cpu_count()) as pool:
        for job, output in zip(jobs, pool.map(lambda job: tidy(*job), jobs)):
            tally.add_check(f"clang-tidy: {job[0].relative_to(ROOT)}\n{output}", not output)
    return tally
