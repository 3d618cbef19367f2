import tempfile
import unittest
from pathlib import Path

from scripts import lint


class Stamp(unittest.TestCase):
    def test_changes_with_all_that_is_included(self) -> None:
        with tempfile.TemporaryDirectory() as folder:
            source, near, far = (Path(folder) / name for name in ("a.cpp", "near.h", "far.h"))
            source.write_text('#include "near.h"\n#include <vector>\n')
            near.write_text('#include "far.h"\n')
            far.write_text("int a;\n")

            def stamp(command: str = "g++") -> str:
                lint.included_files.cache_clear()
                return lint.stamp_of(source, {"command": command})

            first = stamp()
            self.assertEqual(stamp(), first)
            self.assertNotEqual(stamp("clang++"), first)
            for file in (source, near, far):
                before = stamp()
                file.write_text(file.read_text() + "// more\n")
                self.assertNotEqual(stamp(), before, file)
