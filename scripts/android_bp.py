"""Keeps the lists of sources in Android.bp in step with CMake's.

    python3 -B -m scripts.android_bp           writes them
    python3 -B -m scripts.android_bp --check   only tells what differs; exit status 1 if something does
"""

from __future__ import annotations

import argparse
import difflib
import re
import sys
from pathlib import Path

from scripts.building import ROOT

BLUEPRINT = "Android.bp"
LIBRARIES = ("SentrovaService", "SentrovaServiceImpl")
KEYWORDS = {"SHARED", "STATIC", "OBJECT", "PUBLIC", "PRIVATE", "INTERFACE"}
COMMAND = re.compile(r"(\w+)\s*\(([^()]*)\)")


def commands(root: Path) -> list[tuple[str, Path, str, list[str]]]:
    """The commands of the product's CMake files that have a target first: the command's name, its
    folder below `root`, the target and the other arguments."""
    found = []
    for file in [root / "CMakeLists.txt", *sorted(root.glob("*/CMakeLists.txt"))]:
        text = re.sub(r"#.*", "", file.read_text())
        for name, arguments in COMMAND.findall(text):
            target, *others = arguments.split() or [""]
            found.append((name, file.parent.relative_to(root), target, others))
    return found


def library_sources(root: Path, library: str) -> list[str]:
    """What a library is made of, itself and as object libraries that it links, in order."""
    own: dict[str, list[str]] = {}
    objects = set()
    linked = [library]
    for name, folder, target, others in commands(root):
        arguments = [word for word in others if word not in KEYWORDS]
        if name in ("add_library", "target_sources"):
            own.setdefault(target, []).extend(
                (folder / word).as_posix() for word in arguments)
        if name == "add_library" and "OBJECT" in others:
            objects.add(target)
        if name == "target_link_libraries" and target == library:
            linked += arguments
    sources = sorted(source for part in linked if part == library or part in objects
                     for source in own.get(part, []))
    unclear = [source for source in sources if not (root / source).is_file()]
    if unclear or not sources:
        raise ValueError(f"the sources of {library} cannot be told: {unclear or 'none'}")
    return sources


def with_sources(blueprint: str, module: str, sources: list[str]) -> str:
    """The text with the module's list of sources in place of the one that it has."""
    listed = "".join(f'        "{source}",\n' for source in sources)
    pattern = rf'(    name: "{re.escape(module)}",\n(?:    .*\n)*?    srcs: \[\n)(?:        .*\n)*'
    changed, count = re.subn(pattern, lambda found: found[1] + listed, blueprint)
    if count != 1:
        raise ValueError(f"{BLUEPRINT} has no list of sources for {module}")
    return changed


def in_step(root: Path, blueprint: str) -> str:
    for library in LIBRARIES:
        blueprint = with_sources(blueprint, f"lib{library}", library_sources(root, library))
    return blueprint


def main() -> int:
    parser = argparse.ArgumentParser(prog="python3 -B -m scripts.android_bp")
    parser.add_argument("--check", action="store_true", help="change nothing, tell what differs")
    check = parser.parse_args().check
    file = ROOT / BLUEPRINT
    old = file.read_text()
    new = in_step(ROOT, old)
    if not check:
        file.write_text(new)
        return 0
    sys.stdout.writelines(difflib.unified_diff(
        old.splitlines(True), new.splitlines(True), BLUEPRINT, "as CMake has it"))
    return 0 if old == new else 1


if __name__ == "__main__":
    sys.exit(main())
