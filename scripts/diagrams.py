"""The pictures of docs/diagrams: each NAME.svg is drawn from the text beside it, NAME.dot (by
graphviz) or NAME.sequence (by sequence_picture). scripts/draw_diagrams draws them anew."""

from __future__ import annotations

import hashlib
import html
import re
import subprocess
import sys
from pathlib import Path

from scripts import sequence_picture
from scripts.building import ROOT

DIAGRAMS = ROOT / "docs/diagrams"
DOT_LABEL = re.compile(r'label="([^"]*)"')
SVG_TEXT = re.compile(r"<text[^>]*>([^<]*)</text>")


def sources(folder: Path = DIAGRAMS) -> list[Path]:
    return sorted([*folder.glob("*.dot"), *folder.glob("*.sequence")])


def stamp(source: Path) -> str:
    """What a picture of graphviz's ends with: its lines differ from version to version."""
    return f"<!-- {source.name} {hashlib.sha256(source.read_bytes()).hexdigest()} -->\n"


def draw(source: Path) -> None:
    if source.suffix == ".sequence":
        picture = sequence_picture.draw(source.read_text())
    else:
        drawn = subprocess.run(["dot", "-Tsvg", str(source)], capture_output=True, text=True,
                               check=True)
        picture = drawn.stdout + stamp(source)
    source.with_suffix(".svg").write_text(picture)


def fault(source: Path) -> str:
    """What is wrong with the picture of a source; empty when it is in step."""
    target = source.with_suffix(".svg")
    if not target.exists():
        return f"{target.name} is missing"
    picture = target.read_text()
    if source.suffix == ".sequence":
        drawn = picture == sequence_picture.draw(source.read_text())
    else:
        drawn = picture.endswith(stamp(source))
        shown = {words(html.unescape(text)) for text in SVG_TEXT.findall(picture)}
        for label in DOT_LABEL.findall(source.read_text()):
            for line in re.split(r"\\[nlr]", label):
                if words(line) and words(line) not in shown:
                    return f"{target.name} does not show: {line}"
    return "" if drawn else f"{target.name} was not drawn from {source.name} as it is"


def words(text: str) -> str:
    return " ".join(text.split())


def main() -> int:
    for source in sources():
        draw(source)
    faults = [text for source in sources() if (text := fault(source))]
    print("\n".join(faults) if faults else f"{len(sources())} pictures drawn")
    return 1 if faults else 0


if __name__ == "__main__":
    sys.exit(main())
