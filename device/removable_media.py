"""Disks that the host plugs into the virtual device and pulls out again while it runs.

A story names the ports that it needs in a line of its own, `# devices: usb sd`; without it the
device has neither, and starts a bit sooner. Its requests (see host_requests.py) are the names in
`actions`.

Each disk is new at every start: one empty partition, which bears the disk's name in its GPT.
"""

from __future__ import annotations

import subprocess
from collections.abc import Callable, Iterable
from pathlib import Path

from device.host_requests import Action

KINDS = ("usb", "sd")

# A power of two, which QEMU wants of an SD card.
IMAGE_BYTES = 64 << 20

USB_MEDIUM = "usb-medium"
SD_CARD = "sd-card"
# Both controllers call their bus sd-bus; the path tells the second from the first.
SD_BUS = "/gpex-pcihost/pcie.0/sd1/sd-bus"

Qmp = Callable[..., object]

def actions(folder: Path, qmp: Qmp) -> dict[str, Action]:
    """What can be asked for; the disks are in `folder`."""
    return {
        "plug_usb": lambda _: qmp(
            "device_add", driver="usb-storage", id="stick", bus="xhci.0", drive=USB_MEDIUM),
        "unplug_usb": lambda _: qmp("device_del", id="stick"),
        "insert_sd": lambda _: qmp(
            "blockdev-change-medium", id=SD_CARD, filename=str(folder / "sd.img"), format="raw"),
        "eject_sd": lambda _: qmp("eject", id=SD_CARD, force=True),
    }


def wanted_kinds(story: str) -> list[str]:
    """The ports that a story's text asks for; raises ValueError for one that there is not."""
    kinds: list[str] = []
    for line in story.splitlines():
        if line.startswith("# devices:"):
            kinds += line.removeprefix("# devices:").split()
    unknown = set(kinds) - set(KINDS)
    if unknown:
        raise ValueError(f"there is no device {', '.join(sorted(unknown))} for a story")
    return kinds


def make_disks(folder: Path, kinds: Iterable[str]) -> None:
    """Makes the disks for the ports in `folder`."""
    for kind in kinds:
        image = folder / f"{kind}.img"
        with image.open("wb") as file:
            file.truncate(IMAGE_BYTES)
        partition = ["-n", "1:0:0", "-c", f"1:{kind}-disk"]
        subprocess.run(["sgdisk", "-o", *partition, str(image)], check=True,
                       stdout=subprocess.DEVNULL)


def qemu_arguments(folder: Path, kinds: Iterable[str]) -> list[str]:
    """The ports, with nothing plugged in yet."""
    arguments: list[str] = []
    if "usb" in kinds:
        medium = f"driver=raw,node-name={USB_MEDIUM},file.driver=file"
        arguments += ["-device", "qemu-xhci,id=xhci"]
        arguments += ["-blockdev", f"{medium},file.filename={folder}/usb.img"]
    if "sd" in kinds:
        # The card's slot is the second one, so that its disk is mmcblk1.
        arguments += ["-device", "sdhci-pci,id=sd0", "-device", "sdhci-pci,id=sd1"]
        arguments += ["-drive", "if=none,id=sd-medium"]
        arguments += ["-device", f"sd-card,id={SD_CARD},drive=sd-medium,bus={SD_BUS}"]
    return arguments
