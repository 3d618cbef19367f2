import tempfile
import unittest
from pathlib import Path

from device import removable_media


class WantedKinds(unittest.TestCase):
    def test_by_header_line(self) -> None:
        for text, kinds in {
            "# Shows\n. /share/story.sh\n": [],
            "# Shows\n# devices: usb sd\nfinish\n": ["usb", "sd"],
            "# Shows\necho '# devices: usb'\n": [],
        }.items():
            self.assertEqual(removable_media.wanted_kinds(text), kinds, text)

    def test_unknown_kind(self) -> None:
        with self.assertRaisesRegex(ValueError, "floppy"):
            removable_media.wanted_kinds("# devices: usb floppy\n")
