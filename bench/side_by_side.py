"""Builds a program that times the project's code beside the bare work, and runs it."""

import os
import pathlib
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
ANDROID_LIBRARIES = f"/usr/lib/{os.uname().machine}-linux-gnu/android"


def build_and_run(*sources):
    """Exits as the program does: with 1 if a limit is exceeded."""
    with tempfile.TemporaryDirectory(prefix="bench-") as folder:
        program = pathlib.Path(folder) / "program"
        subprocess.run(
            [os.environ.get("CXX", "g++"), "-std=c++20", "-O2", "-DNDEBUG", "-fno-rtti",
             f"-I{ROOT}", "-isystem", "/usr/include/android", *(ROOT / path for path in sources),
             f"-L{ANDROID_LIBRARIES}", f"-Wl,-rpath,{ANDROID_LIBRARIES}", "-lbase",
             "-o", program],
            check=True)
        sys.exit(subprocess.run([program], cwd=folder, check=False).returncode)
