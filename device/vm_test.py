import os
import signal
import subprocess
import sys
import tempfile
import time
import unittest
from pathlib import Path
from unittest import mock

from device import vm

# Stands for QEMU: finds the shared folder among its arguments and does there what $DEVICE_SCRIPT
# says.
FAKE_QEMU = """#!/bin/sh
for word in "$@"; do
  case $word in local,id=share,path=*) share=${word#*path=}; share=${share%%,*};; esac
done
cd "$share" && eval "$DEVICE_SCRIPT"
"""


class RunStory(unittest.TestCase):
    def setUp(self) -> None:
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = Path(folder.name)
        qemu = self.folder / "qemu-system-aarch64"
        qemu.write_text(FAKE_QEMU)
        qemu.chmod(0o755)
        self.story = self.folder / "s.story"
        self.story.write_text("# Shows something\n")
        self.disk = self.folder / "base.img"
        self.disk.write_text("new\n")
        path = f"{self.folder}:{os.environ['PATH']}"
        # A run that is killed cannot remove its own folder.
        patch = mock.patch.dict(os.environ, {"PATH": path, "TMPDIR": folder.name})
        patch.start()
        tempfile.tempdir = None  # forget the folder chosen before
        self.addCleanup(setattr, tempfile, "tempdir", None)
        self.addCleanup(patch.stop)

    def run_story(self, script: str, timeout_seconds: float = 10) -> tuple[vm.Outcome, str]:
        shown: list[str] = []
        with mock.patch.dict(os.environ, {"DEVICE_SCRIPT": script}), vm.Device(
                base_disk=self.disk) as device:
            outcome = device.run_story(self.story, timeout_seconds, shown.append)
            share = device.share
        self.assertFalse(share.exists())
        return outcome, "".join(shown)

    def test_result_and_output(self) -> None:
        outcome, shown = self.run_story(
            "echo one >log.txt; sleep 0.1; : >moments/noted; sleep 0.1; echo two >>log.txt; "
            "echo 3 >result")
        self.assertEqual((outcome.status, outcome.problem), (3, ""))
        self.assertEqual(shown, "one\ntwo\n")
        self.assertTrue(0.1 <= outcome.moments["noted"] <= outcome.seconds)
        outcome, _ = self.run_story("echo reboot,recovery >powerctl")
        self.assertEqual((outcome.power_request, outcome.status), ("reboot,recovery", None))

    def test_no_result_is_a_failure_whatever_qemu_says(self) -> None:
        outcome, _ = self.run_story("echo oops >>qemu.txt; echo panic; exit 0")
        self.assertIsNone(outcome.status)
        self.assertIn("no result", outcome.problem)
        self.assertIn("panic", outcome.problem)

    def test_ports_and_requests(self) -> None:
        # Nobody listens at the machine's socket, so that the request must fail; the story goes on.
        script = ("echo \"$@\" >log.txt; : >requests/plug_usb; "
                  "until [ -s requests/plug_usb.failed ]; do sleep 0.02; done; echo 0 >result")
        self.assertNotIn("qemu-xhci", self.run_story(script)[0].log)
        self.story.write_text("# Shows something\n# devices: usb\n")
        outcome, _ = self.run_story(script)
        self.assertEqual((outcome.status, outcome.problem), (0, ""))
        self.assertIn("qemu-xhci", outcome.log)
        self.assertNotIn("sdhci", outcome.log)

    def test_power_cut_starts_it_again_on_the_same_disk(self) -> None:
        outcome, _ = self.run_story(
            "cat boot ../disk.img >>log.txt; [ $(cat boot) = 1 ] || { echo 0 >result; exit; }; "
            "echo kept >../disk.img; echo 50 >cut; "
            "mv cut requests/cut_power; exec sleep 60")
        self.assertEqual((outcome.status, outcome.log), (0, "1\nnew\n2\nkept"))
        self.assertEqual(self.disk.read_text(), "new\n")

    def test_story_that_ends_the_device(self) -> None:
        self.story.write_text("# Shows something\n# ends: reboot,a,b\n")
        cases = (
            ("echo reboot,a,b >powerctl", 0, ""),
            ("echo 0 >result", None, "the request None, not reboot,a,b"),
            ("echo 1 >result", 1, ""),
            ("exit 0", None, "no result"),
        )
        for script, status, problem in cases:
            with self.subTest(script):
                outcome, _ = self.run_story(script)
                self.assertEqual(outcome.status, status)
                self.assertIn(problem, outcome.problem)
                self.assertEqual(outcome.problem == "", problem == "")

    def test_time_out_ends_it(self) -> None:
        begun = time.monotonic()
        with mock.patch("builtins.print"):
            outcome, _ = self.run_story("echo 0 >result; exec sleep 60", timeout_seconds=0.3)
        self.assertLess(time.monotonic() - begun, 5)
        self.assertIsNone(outcome.status)
        self.assertIn("in time", outcome.problem)

    def test_ends_with_its_parent(self) -> None:
        pid_file = self.folder / "pid"
        program = (f"from pathlib import Path\nfrom device import vm\n"
                   f"with vm.Device(base_disk=Path({str(self.disk)!r})) as d:\n"
                   f"    d.run_story(Path({str(self.story)!r}), 60)\n")
        script = f"echo $$ >{pid_file}.new; mv {pid_file}.new {pid_file}; exec sleep 60"
        parent = subprocess.Popen([sys.executable, "-B", "-c", program], cwd=vm.ROOT,
                                  env={**os.environ, "DEVICE_SCRIPT": script})
        self.wait_for(pid_file.exists)
        pid = int(pid_file.read_text())
        parent.send_signal(signal.SIGKILL)
        parent.wait()
        self.wait_for(lambda: not Path(f"/proc/{pid}").exists()
                      or "Z" in Path(f"/proc/{pid}/stat").read_text().split()[2])

    def wait_for(self, condition: object) -> None:
        end = time.monotonic() + 10
        while not condition():  # type: ignore[operator]
            self.assertLess(time.monotonic(), end)
            time.sleep(0.02)
