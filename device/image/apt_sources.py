"""Prints the Debian bookworm entries among this machine's own apt sources.

The entries are printed in apt's one-line form without their architectures, so that they serve for
the device's as well. Lists of other makers and other releases are left out. Exit status 1 when the
machine has no such entry.
"""

import glob
import shlex
import sys
from collections.abc import Iterator

RELEASE = "bookworm"


def is_release(suite: str) -> bool:
    return suite == RELEASE or suite in (f"{RELEASE}-updates", f"{RELEASE}-security")


def one_line_entries(text: str) -> Iterator[str]:
    """Entries of a *.list file: `deb [options] URI suite component...`."""
    for line in text.splitlines():
        line = line.split("#", 1)[0].strip()
        if not line.startswith("deb "):
            continue
        rest = line[4:].strip()
        options = []
        if rest.startswith("["):
            inside, rest = rest[1:].split("]", 1)
            options = [word for word in shlex.split(inside) if not word.startswith("arch")]
        words = rest.split()
        if len(words) >= 3 and is_release(words[1]):
            prefix = f"deb [{' '.join(options)}] " if options else "deb "
            yield prefix + " ".join(words)


def stanzas(text: str) -> Iterator[dict[str, str]]:
    """The fields of each stanza of a *.sources file, names in lower case."""
    fields: dict[str, str] = {}
    name = ""
    for line in [*text.splitlines(), ""]:
        if line.startswith("#"):
            continue
        if not line.strip():
            if fields:
                yield fields
            fields, name = {}, ""
        elif line[0].isspace():
            fields[name] += "\n" + line
        else:
            name, _, value = line.partition(":")
            name = name.strip().lower()
            fields[name] = value.strip()


def deb822_entries(text: str) -> Iterator[str]:
    """Entries of a *.sources file, each combination of location and suite as a line."""
    for fields in stanzas(text):
        if "deb" not in fields.get("types", "").split() or fields.get("enabled") == "no":
            continue
        signed_by = fields.get("signed-by", "")
        # A key written out in place cannot stand on one line; apt's trusted keys must then do.
        option = f"[signed-by={signed_by}] " if signed_by.startswith("/") else ""
        for uri in fields.get("uris", "").split():
            for suite in filter(is_release, fields.get("suites", "").split()):
                yield f"deb {option}{uri} {suite} {fields.get('components', '')}".rstrip()


def main() -> int:
    entries: list[str] = []
    for path in ["/etc/apt/sources.list", *sorted(glob.glob("/etc/apt/sources.list.d/*"))]:
        reader = {"list": one_line_entries, "sources": deb822_entries}.get(path.rsplit(".", 1)[-1])
        if reader is None:
            continue
        try:
            with open(path, encoding="utf-8", errors="replace") as file:
                entries += reader(file.read())
        except FileNotFoundError:
            continue
    print("\n".join(dict.fromkeys(entries)))
    if not entries:
        print(f"no apt source of Debian {RELEASE} on this machine", file=sys.stderr)
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main())
