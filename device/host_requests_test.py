import tempfile
import unittest
from pathlib import Path

from device import host_requests, removable_media


class Requests(unittest.TestCase):
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
        host_requests.serve(self.requests, removable_media.actions(self.folder, self.qmp))
        return {file.name: file.read_text() for file in self.requests.iterdir()}

    def qmp(self, command: str, **arguments: object) -> object:
        self.commands.append((command, arguments))
        if command == "device_del":
            raise RuntimeError("Device 'stick' not found")
        return {}

    def test_done_is_removed_and_refused_kept_with_its_reason(self) -> None:
        self.assertEqual(self.serve("insert_sd", "plug_usb"), {})
        self.assertEqual([command for command, _ in self.commands],
                         ["blockdev-change-medium", "device_add"])
        self.assertEqual(self.commands[0][1]["filename"], str(self.folder / "sd.img"))
        kept = {"unplug_usb.failed": "Device 'stick' not found\n",
                "open_pod_bay.failed": "there is no request open_pod_bay\n"}
        self.assertEqual(self.serve("unplug_usb", "open_pod_bay"), kept)
        self.assertEqual(self.serve(), kept)
        self.assertEqual(len(self.commands), 3)

    def test_bytes_on_disk(self) -> None:
        disk = self.folder / "disk"
        with disk.open("wb") as file:
            file.write(b"before")
            file.seek(1 << 20)  # a hole
            file.write(b"a\0b")
            file.truncate(2 << 20)
        host_requests.find_on_disk(disk, "8 4088", b"a\0b")
        for partition, absent in (("8 4088", b"ab"), ("8 8", b"a\0b"), ("8 4088", b"before"),
                                  ("8 4088", b"")):
            with self.assertRaises(ValueError):
                host_requests.find_on_disk(disk, partition, absent)
