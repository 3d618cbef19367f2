import re
import subprocess
import tempfile
import unittest
from pathlib import Path

from scripts import diagrams
from scripts.building import ROOT
from scripts.sequence_picture import BadPicture, draw

LINK = re.compile(r"\]\(([^)#:]+)(?:#[^)]*)?\)")


class Documents(unittest.TestCase):
    def test_links_lead_somewhere(self) -> None:
        listed = subprocess.run(
            ["git", "-c", "safe.directory=*", "ls-files", "--cached", "--others",
             "--exclude-standard", "*.md"],
            cwd=ROOT, capture_output=True, text=True, check=True).stdout.splitlines()
        self.assertIn("README.md", listed)
        for name in listed:
            page = ROOT / name
            for link in LINK.findall(page.read_text()):
                with self.subTest(page=name, link=link):
                    self.assertTrue((page.parent / link).exists())

    def test_pictures_are_in_step(self) -> None:
        self.assertGreater(len(diagrams.sources()), 0)
        for source in diagrams.sources():
            self.assertEqual(diagrams.fault(source), "")


class Diagrams(unittest.TestCase):
    def test_notice_what_is_out_of_step(self) -> None:
        for name in ("layers.dot", "unlock.sequence"):
            source_text = (diagrams.DIAGRAMS / name).read_text()
            picture_text = (diagrams.DIAGRAMS / name).with_suffix(".svg").read_text()
            for source, picture in (
                (source_text + "\n# one more\nlane x: y\n", picture_text),
                (source_text.replace("loading program", "other program"), picture_text),
                (source_text, picture_text.replace(">loading program<", "><")),
            ):
                with self.subTest(name), tempfile.TemporaryDirectory() as folder:
                    path = Path(folder) / name
                    path.write_text(source)
                    self.assertIn("is missing", diagrams.fault(path))
                    path.with_suffix(".svg").write_text(picture)
                    self.assertNotEqual(diagrams.fault(path), "")

    def test_a_sequence_refuses_what_it_cannot_draw(self) -> None:
        lanes = "lane a: A\nlane b: B\n"
        self.assertIn(">f() &lt; 1</text>", draw(lanes + "# why\na -> b: f() < 1\n"))
        for line in ("a -> c: f()", "a -> a: f()", "a b: f()", "a --> b: " + 40 * "x"):
            with self.subTest(line), self.assertRaises(BadPicture):
                draw(lanes + line)
