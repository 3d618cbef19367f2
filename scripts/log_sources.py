"""The library's sources as far as its messages need them: tokens, and the definitions of constants
and functions that messages are made with."""

from __future__ import annotations

import re
from dataclasses import dataclass, field
from pathlib import Path

from scripts.building import ROOT

PRODUCT_FOLDERS = ("common", "datadump", "interface", "otautil", "recovery_utils", "service",
                   "toolkit", "toolkitutil")

QUOTED = r'"(?:\\.|[^"\\\n])*"|\'(?:\\.|[^\'\\])\''
COMMENT = re.compile(rf"({QUOTED})|//[^\n]*|/\*.*?\*/", re.DOTALL)
TOKEN = re.compile(rf"{QUOTED}|[A-Za-z_]\w*|\d[\w']*|<<|::|->|\S")
INCLUDE = re.compile(r'^\s*#\s*include\s+[<"]([^>"]+)[>"]', re.MULTILINE)
TEXT_CONSTANT = re.compile(
    r'\b(?:char (\w+)\[\]|string (\w+)) = ("(?:\\.|[^"\\\n])*");')
POSITION_CONSTANT = re.compile(r'\bLogPosition (\w+) = \{"([^"]+)", (\d+)\};')
# A function that prints what it is given at a line of one fixed file.
WRAPPER = re.compile(
    r"\bvoid (\w+)\(unsigned int line,[\w: ]*(?<=[ :])(?:LogSeverity severity, std::|std::)"
    r"string_view text\) \{\s*(?:sentrova::)?(p?log_at)\((?:\{\"([^\"]+)\", line\}|at\(line\)), "
    r"(?:[\w:]*::)?(\w+), text\);\s*\}")
POSITION_FUNCTION = re.compile(
    r'LogPosition at\(unsigned int line\) \{\s*return \{"([^"]+)", line\}')
# Rows of line numbers: struct NAME { unsigned int a; ... } and its constants.
LINE_STRUCT = re.compile(r"struct (\w+) \{((?:\s*unsigned int \w+;)+)\s*\};")
LINE_ROW = re.compile(r"constexpr (\w+) \w+ = \{([\d, ]+)\};")


class NotUnderstood(Exception):
    """A call that prints, of a kind that is not known here."""


@dataclass
class Source:
    name: str  # its path below the root
    code: str  # without comments and includes
    tokens: list[str]
    texts: dict[str, str] = field(default_factory=dict)
    positions: dict[str, tuple[str, str]] = field(default_factory=dict)
    wrappers: dict[str, tuple[str, str, str]] = field(default_factory=dict)
    line_rows: dict[str, list[str]] = field(default_factory=dict)


def without_comments(text: str) -> str:
    return INCLUDE.sub("", COMMENT.sub(lambda match: match[1] or " ", text))


def product_sources(root: Path = ROOT) -> list[Source]:
    paths = [path for folder in PRODUCT_FOLDERS for path in sorted((root / folder).rglob("*"))
             if path.suffix in (".cpp", ".h") and not path.stem.endswith("_test")]
    raw = {str(path.relative_to(root)): path.read_text() for path in paths}
    own = {name: read_source(name, text) for name, text in raw.items()}
    for name, text in raw.items():
        for header in INCLUDE.findall(text):
            if header in own:
                add_definitions(own[name], own[header].code)
    return list(own.values())


def read_source(name: str, text: str) -> Source:
    code = without_comments(text)
    if 'R"' in code:
        raise NotUnderstood(f"{name}: a raw string")
    source = Source(name, code, TOKEN.findall(code))
    add_definitions(source, code)
    return source


def add_definitions(source: Source, code: str) -> None:
    """Takes over what a source's own code or a header that it includes defines."""
    for array, string, literal in TEXT_CONSTANT.findall(code):
        text = unquote(literal)
        if source.texts.setdefault(array or string, text) != text:
            raise NotUnderstood(f"{source.name}: two constants {array or string}")
    for name, file, line in POSITION_CONSTANT.findall(code):
        source.positions[name] = (file, line)
    at_file = "".join(POSITION_FUNCTION.findall(code))
    if at_file:
        source.positions["at"] = (at_file, "")
    for name, function, file, severity in WRAPPER.findall(code):
        source.wrappers[name] = (file or at_file, severity, function)
    rows = LINE_ROW.findall(code)
    for struct, body in LINE_STRUCT.findall(code):
        for index, member in enumerate(re.findall(r"int (\w+);", body)):
            source.line_rows[member] = [numbers.split(", ")[index]
                                        for name, numbers in rows if name == struct]


def unquote(literal: str) -> str:
    escapes = {"n": "\n", "t": "\t", "v": "\v", "f": "\f", "r": "\r", "0": "\0"}
    return re.sub(r"\\(.)", lambda match: escapes.get(match[1], match[1]), literal[1:-1])


def is_literal(token: str) -> bool:
    return token.startswith('"')


def split(tokens: list[str], separator: str) -> list[list[str]]:
    """Splits at the separators that stand in no brackets."""
    pieces: list[list[str]] = [[]]
    depth = 0
    for token in tokens:
        depth += (token in "([{") - (token in ")]}")
        if token == separator and depth == 0:
            pieces.append([])
        else:
            pieces[-1].append(token)
    return pieces


def closing(tokens: list[str], start: int) -> int:
    """The index of the bracket that closes the one at `start`."""
    depth = 0
    for index in range(start, len(tokens)):
        depth += (tokens[index] in "([{") - (tokens[index] in ")]}")
        if depth == 0:
            return index
    raise NotUnderstood("an open bracket")
