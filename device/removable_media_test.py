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


class ServeRequests(unittest.TestCase):
    def setUp(self) -> None:
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = Path(folder.name)
        self.requests = self.folder / "requests"
        self.requests.mkdir()
        self.commands: list[tuple[str, dict[str, object]]] = []

    def serve(self, *names: str) -> dict[str, str]:
        """Serves the requests; returns what is then in the folder."""
        for name in names:
            (self.requests / name).touch()
        removable_media.serve_requests(self.requests, self.folder, self.qmp)
        return {file.name: file.read_text() for file in self.requests.iterdir()}

    def qmp(self, command: str, **arguments: object) -> object:
        self.commands.append((command, arguments))
        if command == "device_del":
            raise RuntimeError("Device 'stick' not found")
        return {}

    def test_done_is_removed(self) -> None:
        self.assertEqual(self.serve("insert_sd", "plug_usb"), {})
        self.assertEqual([command for command, _ in self.commands],
                         ["blockdev-change-medium", "device_add"])
        self.assertEqual(self.commands[0][1]["filename"], str(self.folder / "sd.img"))

    def test_refused_is_kept_with_its_reason_and_tried_once(self) -> None:
        kept = {"unplug_usb.failed": "Device 'stick' not found\n"}
        self.assertEqual(self.serve("unplug_usb"), kept)
        self.assertEqual(self.serve(), kept)
        self.assertEqual(len(self.commands), 1)

    def test_unknown(self) -> None:
        self.assertEqual(self.serve("open_pod_bay"),
                         {"open_pod_bay.failed": "there is no request open_pod_bay\n"})
        self.assertEqual(self.commands, [])
