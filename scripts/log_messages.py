"""Finding every message that the library can print, in its sources.

A message is a call of one of the few things that print; what it prints is put together from the
call's literals, with <names> in place of values. `unclaimed` looks at the sources again in a cruder
way, so that a message which is printed by other means does not stay unnoticed.
"""

from __future__ import annotations

import re
from collections import Counter
from collections.abc import Iterator
from dataclasses import dataclass, field
from pathlib import Path

from scripts.log_sources import (QUOTED, WRAPPER, NotUnderstood, Source, closing, is_literal,
                                 split, unquote)

CONVERSION = re.compile(r"%(?:%|[-+ #0]*\d*(?:\.\d+)?(?:hh|h|ll|l|z|j|t)?[diouxXcsp])")
# All that could print, for the cruder look.
PRINTING = re.compile(
    r"\b(?:v?[fd]?printf|f?puts|f?putc|putchar|perror|v?syslog|psignal|P?LOG(?:_\w+)?|[ASR]LOG\w+|"
    r"D?P?CHECK(?:_\w+)?|p?log_at|LogMessage|write_log_line|__android_log_\w+)\s*\(|"
    r"\b(?:cout|cerr|clog)\b")

LEVELS = {"E": "error", "W": "warning", "I": "info"}
SEVERITIES = {"INFO": "info", "WARNING": "warning", "ERROR": "error", "FATAL": "fatal",
              "FATAL_WITHOUT_ABORT": "fatal"}
COMPARISONS = {"CHECK_EQ": "==", "CHECK_NE": "!=", "CHECK_LE": "<=", "CHECK_LT": "<",
               "CHECK_GE": ">=", "CHECK_GT": ">"}
# Names for values whose expressions do not tell.
VALUE_NAMES = {
    "args[0]": "program", "cmd": "command", "errno": "error number", "error": "error number",
    "std::to_string(end-start)": "seconds", "WTERMSIG(status)": "signal number",
    "std::string(line->substr(start))": "path", "range_addr": "address", "range_length": "length",
    "std::to_string(userId)": "user id", "userId": "user id", "ToString()": "ranges",
    "std::to_string(enabled)": "1 or 0", "kept_file": "file", "i": "number",
    "std::to_string(i)": "number",
}
# Literals that look like text for people and are none, by source.
NO_MESSAGES = {
    "toolkit/zuno_func_path.cpp": {'"The parameter is empty"'},  # the caller gets it
    "toolkit/zuno_func_text.cpp": {r'" \t\n\v\f\r"'},
}


@dataclass(frozen=True)
class Message:
    source: str
    text: str    # with <names> for values
    level: str   # of LEVELS and SEVERITIES, or empty
    where: str   # "stdout", "system log", or the position in the base log: FILE or FILE:LINE


@dataclass
class Found:
    """What was found in one source, with what it was found by."""
    messages: list[Message] = field(default_factory=list)
    calls: int = 0
    literals: Counter[str] = field(default_factory=Counter)


def value_name(source: Source, tokens: list[str]) -> str:
    """What stands for a value in a message: a known text, or a name in angle brackets."""
    if len(tokens) == 1 and tokens[0] in source.texts:
        return source.texts[tokens[0]]
    if all(map(is_literal, tokens)):
        return "".join(map(unquote, tokens))
    if "?" in tokens:
        condition = tokens.index("?")
        names = [value_name(source, piece) for piece in split(tokens[condition + 1:], ":")]
        blank = " " if all(name.startswith(" ") for name in names) else ""
        return f"{blank}<{' or '.join(name.strip(' <>') for name in names)}>"
    if tokens[-4:] == [".", "c_str", "(", ")"] or tokens[-4:] == [".", "size", "(", ")"]:
        return value_name(source, tokens[:-4])
    spelling = "".join(tokens)
    if spelling in VALUE_NAMES:
        return f"<{VALUE_NAMES[spelling]}>"
    if tokens[0] == "strerror":
        return "<error>"
    names = [token for token in tokens if re.fullmatch(r"[A-Za-z_]\w*", token)]
    return f"<{names[-1].rstrip('_').replace('_', ' ') if names else spelling}>"


def joined_text(source: Source, tokens: list[str], operator: str) -> str:
    """The text that `+` or `<<` puts together."""
    text = ""
    for term in split(tokens, operator):
        while term[0] == "(" and closing(term, 0) == len(term) - 1:
            term = term[1:-1]
        if term[:4] == ["std", "::", "string", "("] and closing(term, 3) == len(term) - 1:
            text += joined_text(source, term[4:-1], "+")
        elif term == ["std", "::", "endl"]:
            text += "\n"
        elif len(term) > 1 and len(split(term, "+")) > 1:
            text += joined_text(source, term, "+")
        else:
            text += value_name(source, term)
    return text


def formatted_text(source: Source, arguments: list[list[str]]) -> str:
    """The text that a format and its arguments make."""
    if not arguments[0] or not all(map(is_literal, arguments[0])):
        raise NotUnderstood(f"{source.name}: a format that is no literal: {arguments[0]}")
    values = [value_name(source, argument) for argument in arguments[1:]]
    text = "".join(map(unquote, arguments[0]))
    conversions = [found for found in CONVERSION.findall(text) if found != "%%"]
    if len(conversions) != len(values):
        raise NotUnderstood(f"{source.name}: {text!r} does not fit its arguments")
    remaining = iter(values)
    return CONVERSION.sub(
        lambda match: "%" if match[0] == "%%" else next(remaining), text)


def printed_level(text: str) -> str:
    head = re.match(r"(?:\[\w+\])?([EWI]):", text)
    return LEVELS[head[1]] if head else ""


def positions(source: Source, tokens: list[str]) -> list[str]:
    """The places FILE:LINE that the position argument of a call stands for."""
    file, line = "", tokens[-1]
    if tokens[0] == "{":
        file, line = unquote(tokens[1]), tokens[3]
    elif tokens[-1] in source.positions:
        file, line = source.positions[tokens[-1]]
    elif tokens[-1] == ")":
        file, line = source.positions["at"][0], tokens[-2]
    lines = [line] if line.isdigit() else source.line_rows.get(line, [])
    if not file or not lines:
        raise NotUnderstood(f"{source.name}: the position {' '.join(tokens)}")
    return [f"{Path(file).name}:{number}" for number in lines]


def calls(source: Source) -> Iterator[tuple[str, list[str], list[str]]]:
    """All calls that print: the function, its arguments, and what `<<` adds."""
    names = {"fprintf", "LOG", "PLOG", "CHECK", "log_at", "plog_at", "__android_log_print", "cout",
             *COMPARISONS, *source.wrappers}
    tokens = source.tokens
    for index, name in enumerate(tokens):
        following = tokens[index + 1] if index + 1 < len(tokens) else ""
        if name not in names or following != ("<<" if name == "cout" else "("):
            continue
        end = index if name == "cout" else closing(tokens, index + 1)
        # A definition, not a call, if a type stands in front of it.
        if name in source.wrappers and tokens[index - 1] == "void":
            continue
        rest = tokens[end + 1:end + 1 + split_end(tokens[end + 1:])]
        yield name, tokens[index + 2:end], rest[1:] if rest[:1] == ["<<"] else []


def split_end(tokens: list[str]) -> int:
    """How many tokens stand before the end of the statement."""
    depth = 0
    for index, token in enumerate(tokens):
        depth += (token in "([{") - (token in ")]}")
        if depth < 0 or (token == ";" and depth == 0):
            return index
    return len(tokens)


def understand(source: Source, name: str, inside: list[str],
               added: list[str]) -> list[tuple[str, str, str]]:
    """The text, level and place of each message that one call may be."""
    arguments = split(inside, ",")
    if name == "fprintf":
        if arguments[0] != ["stdout"]:
            raise NotUnderstood(f"{source.name}: fprintf to {arguments[0]}")
        text = formatted_text(source, arguments[1:])
        return [(text, printed_level(text), "stdout")]
    if name == "cout":
        return [(joined_text(source, added, "<<"), "", "stdout")]
    if name == "__android_log_print":
        level = arguments[0][0].removeprefix("ANDROID_LOG_").lower()
        return [(formatted_text(source, arguments[2:]), level, "system log")]
    file = Path(source.name).name
    if name in ("LOG", "PLOG"):
        text = joined_text(source, added, "<<") + (": <error>" if name == "PLOG" else "")
        return [(text, SEVERITIES[inside[0]], file)]
    if name == "CHECK" or name in COMPARISONS:
        condition = "".join(inside)
        if name in COMPARISONS:
            left, right = ("".join(argument) for argument in arguments)
            left_value, right_value = (value_name(source, argument) for argument in arguments)
            condition = (f"{left} {COMPARISONS[name]} {right} "
                         f"({left}={left_value}, {right}={right_value})")
        return [(f"Check failed: {condition} " + joined_text(source, added, "<<"), "fatal", file)]
    if name in source.wrappers:
        wrapper_file, severity, function = source.wrappers[name]
        if severity == "severity":
            severity = arguments.pop(1)[-1]
        places = positions(source, ["{", f'"{wrapper_file}"', ",", arguments[0][-1]])
    else:
        function, severity = name, arguments[1][-1]
        places = positions(source, arguments[0])
    text = joined_text(source, arguments[-1], "+") + (": <error>" if function == "plog_at" else "")
    return [(text, SEVERITIES[severity], place) for place in places]


def find_messages(source: Source) -> Found:
    found = Found()
    for name, inside, added in calls(source):
        if name in ("log_at", "plog_at") and (inside[-1:] == ["text"] or source.name.endswith(
                "log_at.h")):
            continue  # a wrapper's own call, or the definition
        found.calls += 1
        found.literals.update(filter(is_literal, inside + added))
        for text, level, where in understand(source, name, inside, added):
            if text.strip():
                found.messages.append(Message(source.name, text, level, where))
    return found


def unclaimed(source: Source, found: Found) -> list[str]:
    """What looks like a part of a message but was not found to be one: literals that hold a blank,
    and names of what prints."""
    crude = Counter(filter(is_literal, re.findall(QUOTED, source.code)))
    texts = Counter({text: count for text, count in crude.items() if " " in text})
    texts -= found.literals
    missed = [f"{source.name}: {text} is in no message" for text in texts
              if text not in NO_MESSAGES.get(source.name, ())]
    wrapped = {name for name, (_, _, function) in source.wrappers.items() if function}
    own = re.findall(rf"(?<!void )\b(?:{'|'.join(wrapped)})\(", source.code) if wrapped else []
    definitions = len(WRAPPER.findall(source.code))
    printing = len(PRINTING.findall(source.code)) + len(own) - definitions
    if source.name != "common/log_at.h" and printing != found.calls:
        missed.append(f"{source.name}: {printing} calls print, {found.calls} were understood")
    return missed
