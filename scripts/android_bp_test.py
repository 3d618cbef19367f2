import tempfile
import unittest
from pathlib import Path

from scripts.android_bp import BLUEPRINT, in_step, library_sources, with_sources
from scripts.building import ROOT

TREE = {
    "CMakeLists.txt": "add_library(Lib SHARED)\ntarget_link_libraries(Lib\n  PUBLIC Other PRIVATE unit)",
    "own/CMakeLists.txt": "target_sources(Lib PRIVATE\n  b.cpp  # not c.cpp\n  a.cpp)",
    "own/a.cpp": "",
    "own/b.cpp": "",
    "unit/CMakeLists.txt": "add_library(unit OBJECT u.cpp)\nadd_library(unlinked OBJECT x.cpp)\n"
                           "sentrova_test(unit_tests\n  SOURCES u_test.cpp)",
    "unit/u.cpp": "",
    "other/CMakeLists.txt": "add_library(Other SHARED o.cpp)",
}
MODULES = '''m {
    name: "libA",
    srcs: [
        "old.cpp",
    ],
    libs: [
        "kept",
    ],
}
m {
    name: "libB",
    srcs: [
    ],
}
'''


class AndroidBp(unittest.TestCase):
    def test_is_in_step_with_cmake(self) -> None:
        blueprint = (ROOT / BLUEPRINT).read_text()
        self.assertEqual(in_step(ROOT, blueprint), blueprint, "run python3 -B -m scripts.android_bp")

    def test_sources_are_the_library_and_its_linked_units(self) -> None:
        with tempfile.TemporaryDirectory() as name:
            root = Path(name)
            for path, text in TREE.items():
                (root / path).parent.mkdir(exist_ok=True)
                (root / path).write_text(text)
            self.assertEqual(library_sources(root, "Lib"), ["own/a.cpp", "own/b.cpp", "unit/u.cpp"])
            (root / "unit/u.cpp").unlink()
            for library in ("Lib", "Nobody"):
                self.assertRaises(ValueError, library_sources, root, library)

    def test_only_the_modules_own_list_changes(self) -> None:
        changed = with_sources(MODULES, "libA", ["x.cpp", "y.cpp"])
        self.assertEqual(
            changed, MODULES.replace('        "old.cpp",\n', '        "x.cpp",\n        "y.cpp",\n'))
        self.assertIn('srcs: [\n        "z.cpp",\n    ],\n}\n', with_sources(MODULES, "libB", ["z.cpp"]))
        self.assertRaises(ValueError, with_sources, MODULES, "libC", [])
