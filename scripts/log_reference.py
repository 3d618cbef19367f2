"""The page on the messages of the library, docs/log-reference.md.

Made of the messages that the sources print and of docs/log-meanings.toml, which says by hand what
each means and what to do. Run without arguments it writes the page; with --check it only tells
whether the page is complete and in step with both. Exit status: 0, or 1 with what is wrong.
"""

from __future__ import annotations

import sys
import tomllib
from dataclasses import dataclass
from pathlib import Path

from scripts.building import ROOT
from scripts.log_messages import Message, find_messages, unclaimed
from scripts.log_sources import NotUnderstood, product_sources

PAGE = ROOT / "docs/log-reference.md"
MEANINGS = ROOT / "docs/log-meanings.toml"

# The units, by how the names of their sources begin.
UNITS = (
    ("service/", "The service (`service`)"),
    ("recovery_utils/volume_table", "Volumes (`roots`)"),
    ("recovery_utils/roots_ex", "The vendor's volume code (`roots_ex`)"),
    ("recovery_utils/roots", "Volumes (`roots`)"),
    ("recovery_utils/mounts_ex", "Mounted volumes and what holds them (`mounts_ex`)"),
    ("otautil/rangeset", "Block ranges (`otautil/rangeset`)"),
    ("otautil/sysutil", "Block maps, mapped files, reboot (`otautil/sysutil`)"),
    ("datadump/", "The data-dump record (`datadump`)"),
    ("toolkit/", "Helpers (`toolkit`)"),
    ("toolkitutil/", "The file finder (`toolkitutil`)"),
)

HEAD = """\
# Log reference

Every message that the library prints. The texts are taken from its sources and the meanings from
`log-meanings.toml`; `python3 -B -m scripts.log_reference` writes the page anew. Field tools rely
upon the texts: they are kept as they are, odd spellings included.

- **stdout**: a line on the standard output of the process, mostly with the unit's tag in brackets
  and a level: `E` error, `W` warning, `I` information. A few lines have no tag.
- `FILE` or `FILE:LINE`: a line in the platform's base log, which the loading program directs (the
  system log on Android and standard error elsewhere by default). The file is shown without its
  folder. `FILE:LINE` is fixed, wherever the code stands now; with `FILE` alone the line shown is
  where the call stands in that version's sources.
- **system log**: a line in the system log without a tag.

`<names>` stand for values; `<error>` is the system's text for `errno`. A fatal line ends the
process. A dash says that nothing needs to be done. The platform's own lines are not listed.
"""


class Incomplete(Exception):
    """Messages and meanings do not fit each other, or a message was not found."""


@dataclass
class Row:
    """One text, with all places that print it."""
    text: str
    level: str
    places: list[str]


def unit_of(message: Message) -> str:
    for prefix, unit in UNITS:
        if message.source.startswith(prefix):
            return unit
    raise Incomplete(f"{message.source} belongs to no unit")


def collect(root: Path = ROOT) -> dict[str, list[Row]]:
    """The rows of each unit, in the order of the units and of their sources."""
    rows: dict[str, list[Row]] = {unit: [] for _, unit in UNITS}
    missed: list[str] = []
    try:
        for source in product_sources(root):
            found = find_messages(source)
            missed += unclaimed(source, found)
            for message in found.messages:
                add_message(rows[unit_of(message)], message)
    except NotUnderstood as problem:
        raise Incomplete(str(problem)) from problem
    if missed:
        raise Incomplete("\n".join(missed))
    return {unit: rows[unit] for _, unit in UNITS}


def add_message(rows: list[Row], message: Message) -> None:
    for row in rows:
        if (row.text, row.level) == (message.text, message.level):
            row.places += [message.where] if message.where not in row.places else []
            return
    rows.append(Row(message.text, message.level, [message.where]))


def read_meanings(path: Path) -> dict[str, tuple[str, str]]:
    """What each text means, and what to do, by the text without blanks and line ends around it."""
    entries = tomllib.loads(path.read_text())["message"]
    texts = [entry["text"] for entry in entries]
    twice = {text for text in texts if texts.count(text) > 1}
    if twice:
        raise Incomplete(f"{path.name} has twice: {sorted(twice)}")
    return {entry["text"]: (folded(entry["means"]), folded(entry.get("do", "–")))
            for entry in entries}


def folded(text: str) -> str:
    return " ".join(text.split())


def check_complete(units: dict[str, list[Row]], meanings: dict[str, tuple[str, str]]) -> None:
    texts = {row.text.strip() for rows in units.values() for row in rows}
    problems = [f"without a meaning: {text}" for text in sorted(texts - meanings.keys())]
    problems += [f"a meaning without a message: {text}"
                 for text in sorted(meanings.keys() - texts)]
    problems += [f"the meaning is empty: {text}" for text, (means, _) in meanings.items()
                 if not means]
    if problems:
        raise Incomplete("\n".join(problems))


def code_span(text: str) -> str:
    """The text as one line of a table's cell."""
    one_line = text.strip().replace("\n", " ⏎ ").replace("|", "\\|")
    return f"`{one_line}`"


def form(row: Row) -> str:
    """What of a text's form a table does not show."""
    ends = {"\n\n": " An empty line follows.", " ": " A blank ends the line."}
    line = row.text.removesuffix("\n")
    notes = "".join(note for end, note in ends.items() if (line + "\n").endswith(end + "\n"))
    if row.places == ["stdout"] and line == row.text:
        notes += " No line end follows."
    return notes


def make_page(units: dict[str, list[Row]], meanings: dict[str, tuple[str, str]]) -> str:
    parts = [HEAD]
    for unit, rows in units.items():
        lines = [f"\n## {unit}\n", "| message | level | where | what it means | what to do |",
                 "|---|---|---|---|---|"]
        for row in rows:
            means, do = meanings[row.text.strip()]
            cells = [code_span(row.text), row.level or "–", ", ".join(row.places),
                     means + form(row), do]
            lines.append(f"| {' | '.join(cells)} |")
        parts.append("\n".join(lines) + "\n")
    return "".join(parts)


def current_page() -> str:
    units, meanings = collect(), read_meanings(MEANINGS)
    check_complete(units, meanings)
    return make_page(units, meanings)


def main(arguments: list[str]) -> int:
    try:
        page = current_page()
        if arguments == ["--check"]:
            if PAGE.read_text() != page:
                raise Incomplete(f"{PAGE.name} is not what the sources and meanings make; run "
                                 "python3 -B -m scripts.log_reference")
        else:
            PAGE.write_text(page)
    except Incomplete as problem:
        print(problem, file=sys.stderr)
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
