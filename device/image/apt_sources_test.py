import unittest

from device.image.apt_sources import deb822_entries, one_line_entries


class OneLineEntries(unittest.TestCase):
    def test_families(self) -> None:
        for line, expected in (
            ("deb http://a bookworm-security main # why", ["deb http://a bookworm-security main"]),
            (
                "deb [arch=amd64 signed-by=/k.gpg] http://a bookworm-updates main",
                ["deb [signed-by=/k.gpg] http://a bookworm-updates main"],
            ),
            ("deb-src http://a bookworm main", []),
            ("# deb http://a bookworm main", []),
            ("deb http://a sid main", []),
            ("deb http://a tool-bookworm main", []),
            ("deb http://a", []),
        ):
            self.assertEqual(list(one_line_entries(line)), expected, line)


class Deb822Entries(unittest.TestCase):
    def test_each_location_and_suite(self) -> None:
        text = (
            "# a comment\nTypes: deb deb-src\nURIs: http://a http://b\nSuites: bookworm nodistro\n"
            "Components: main\nArchitectures: amd64\nSigned-By: /k.gpg\n\n"
            "Types: deb\nURIs: http://c\nSuites: nodistro\nComponents: main\n"
        )
        self.assertEqual(
            list(deb822_entries(text)),
            ["deb [signed-by=/k.gpg] http://a bookworm main",
             "deb [signed-by=/k.gpg] http://b bookworm main"],
        )

    def test_left_out(self) -> None:
        for change in ("Enabled: no\n", "Types: deb-src\n", "Suites: trixie\n"):
            text = "Types: deb\nURIs: http://a\nSuites: bookworm\nComponents: main\n" + change
            self.assertEqual(list(deb822_entries(text)), [], change)

    def test_key_in_place(self) -> None:
        text = ("Types: deb\nURIs: http://a\nSuites: bookworm\nComponents: main\n"
                "Signed-By:\n -----BEGIN PGP PUBLIC KEY BLOCK-----\n .\n mQIN\n")
        self.assertEqual(list(deb822_entries(text)), ["deb http://a bookworm main"])
