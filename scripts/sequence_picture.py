"""Draws who calls whom in time, as SVG, from a text of these lines:

    lane NAME: TITLE      a column, in order from the left
    == TEXT               a rule across all columns
    NAME -> NAME: TEXT    a call
    NAME --> NAME: TEXT   an answer
    # TEXT                a comment

The same text always gives the same picture."""

from __future__ import annotations

import re
from html import escape

LANE_WIDTH = 205
ROW_HEIGHT = 30
BOX_WIDTH, BOX_HEIGHT = 150, 32
TOP = 20
CHARACTER_WIDTH = 6.8  # of the font's, on average

LANE = re.compile(r"lane (\w+): (.+)")
RULE = re.compile(r"== (.+)")
CALL = re.compile(r"(\w+) (--?)> (\w+): (.+)")

# The white edge of a text keeps the columns' lines from crossing it.
HEAD = """<svg xmlns="http://www.w3.org/2000/svg" width="{width}" height="{height}" \
viewBox="0 0 {width} {height}" font-family="Helvetica, Arial, sans-serif" font-size="13">
<defs><marker id="tip" viewBox="0 0 8 8" refX="8" refY="4" markerWidth="9" markerHeight="9" \
orient="auto"><path d="M0,0 L8,4 L0,8 z" fill="#334"/></marker></defs>
<rect width="100%" height="100%" fill="white"/>
"""
TEXT = ('<text x="{x:g}" y="{y:g}" text-anchor="middle" fill="#112" stroke="white" '
        'stroke-width="4" paint-order="stroke"{more}>{text}</text>\n')
LANE_STYLE = ' stroke-dasharray="3 5" stroke-opacity="0.6"'
LINE = '<line x1="{x1:g}" y1="{y1:g}" x2="{x2:g}" y2="{y2:g}" stroke="#334"{more}/>\n'


class BadPicture(Exception):
    """A line that cannot be drawn."""


def draw(source: str) -> str:
    """The picture as SVG; raises BadPicture."""
    lines = [line for line in source.splitlines() if line and not line.startswith("#")]
    lanes = [match for line in lines if (match := LANE.fullmatch(line))]
    rows = [line for line in lines if not LANE.fullmatch(line)]
    columns = {lane[1]: (index + 0.5) * LANE_WIDTH for index, lane in enumerate(lanes)}
    width = len(lanes) * LANE_WIDTH
    first_row = TOP + BOX_HEIGHT + ROW_HEIGHT
    height = first_row + len(rows) * ROW_HEIGHT

    parts = [HEAD.format(width=width, height=height)]
    for x in columns.values():
        parts.append(LINE.format(x1=x, y1=TOP, x2=x, y2=height, more=LANE_STYLE))
    for lane in lanes:
        parts.append(draw_box(columns[lane[1]], lane[2]))
    for index, row in enumerate(rows):
        y = first_row + index * ROW_HEIGHT
        parts.append(draw_row(row, y, columns, width))
    return "".join([*parts, "</svg>\n"])


def draw_box(x: float, text: str) -> str:
    box = (f'<rect x="{x - BOX_WIDTH / 2:g}" y="{TOP}" width="{BOX_WIDTH}" height="{BOX_HEIGHT}" '
           'fill="#d9e7f7" stroke="#2f6db3"/>\n')
    return box + (f'<text x="{x:g}" y="{TOP + 21}" text-anchor="middle" fill="#112">'
                  f"{escape(text)}</text>\n")


def draw_row(row: str, y: float, columns: dict[str, float], width: float) -> str:
    if rule := RULE.fullmatch(row):
        line = LINE.format(x1=0, y1=y - 4, x2=width, y2=y - 4, more=' stroke-opacity="0.4"')
        return line + TEXT.format(x=width / 2, y=y, more=' font-weight="bold"',
                                  text=escape(rule[1]))
    call = CALL.fullmatch(row)
    if call is None or not {call[1], call[3]} <= columns.keys() or call[1] == call[3]:
        raise BadPicture(f"cannot draw the line: {row}")
    start, end = columns[call[1]], columns[call[3]]
    if len(call[4]) * CHARACTER_WIDTH > abs(end - start):
        raise BadPicture(f"the text is longer than its arrow: {row}")
    answer = ' stroke-dasharray="7 4"' if call[2] == "--" else ""
    line = LINE.format(x1=start, y1=y, x2=end, y2=y, more=answer + ' marker-end="url(#tip)"')
    return line + TEXT.format(x=(start + end) / 2, y=y - 6, more="", text=escape(call[4]))
