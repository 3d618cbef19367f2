import tempfile
import unittest
from pathlib import Path

from scripts import log_reference
from scripts.log_reference import Incomplete

HEADER = """#pragma once
inline constexpr char kLogTag[] = "TAG";
inline LogPosition at(unsigned int line) { return {"toolkit/fixed.cpp", line}; }
inline void error(unsigned int line, std::string_view text) {
  log_at(at(line), android::base::ERROR, text);
}
"""

UNDERSTOOD = (
    ('fprintf(stdout, "[%s]E: %s is %d%% "\n "full (%s)\\n", kLogTag, row.blk_device.c_str(), ok ? '
     '1 : 0,\n strerror(errno));',
     "[TAG]E: <blk device> is <1 or 0>% full (<error>)\n", "error", ["stdout"]),
    ('PLOG(ERROR) << "cut " << piece.size()\n << (x ? " here" : " there");',
     "cut <piece> <here or there>: <error>", "error", ["a.cpp"]),
    ('CHECK_LT(a, b) << "no";', "Check failed: a < b (a=<a>, b=<b>) no", "fatal", ["a.cpp"]),
    ('constexpr LogPosition kHere = {"toolkit/old.cpp", 7};\n'
     'plog_at(kHere, android::base::WARNING, "no " + name);',
     "no <name>: <error>", "warning", ["old.cpp:7"]),
    ('struct Lines { unsigned int a; unsigned int end; };\nconstexpr Lines kOne = {1, 2};\n'
     'constexpr Lines kTwo = {3, 4};\nvoid f() { log::error(lines.end, "done // \\"x\\""); }',
     'done // "x"', "error", ["fixed.cpp:2", "fixed.cpp:4"]),
    ('// fprintf(stdout, "not this");\n'
     '__android_log_print(ANDROID_LOG_ERROR, nullptr, "at %s.", p);',
     "at <p>.", "error", ["system log"]),
)

NOT_UNDERSTOOD = (
    'fputs("a new way", stdout);',
    'my_own_printer("a new way");',
    'fprintf(stderr, "elsewhere\\n");',
    'fprintf(stdout, format, 3);',
    'fprintf(stdout, "%s %d\\n", one);',
    'std::cerr << "elsewhere";',
    'log_at(computed(), android::base::ERROR, "where?");',
    'syslog(3, "x");',
)


def collect(code: str) -> list[tuple[str, str, list[str]]]:
    with tempfile.TemporaryDirectory() as name:
        folder = Path(name) / "toolkit"
        folder.mkdir()
        (folder / "tag.h").write_text(HEADER)
        (folder / "a.cpp").write_text(f'#include "toolkit/tag.h"\nvoid g() {{\n{code}\n}}\n')
        units = log_reference.collect(Path(name))
    return [(row.text, row.level, row.places) for rows in units.values() for row in rows]


class LogReference(unittest.TestCase):
    def test_page_is_complete_and_in_step(self) -> None:
        self.assertEqual(log_reference.PAGE.read_text(), log_reference.current_page(),
                         "run python3 -B -m scripts.log_reference")

    def test_finds_messages_or_says_that_it_cannot(self) -> None:
        for code, *expected in UNDERSTOOD:
            with self.subTest(code):
                self.assertEqual(collect(code), [tuple(expected)])
        for code in NOT_UNDERSTOOD:
            with self.subTest(code), self.assertRaises(Incomplete):
                collect(code)

    def test_each_message_has_a_meaning_and_each_meaning_a_message(self) -> None:
        units = {"unit": [log_reference.Row("said\n", "", ["stdout"])]}
        log_reference.check_complete(units, {"said": ("why", "what")})
        for meanings in ({}, {"said": ("", "what")}, {"said": ("why", ""), "other": ("why", "")}):
            with self.assertRaises(Incomplete):
                log_reference.check_complete(units, meanings)
