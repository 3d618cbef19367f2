"""The man page and the completions of sentrova, held against what the program itself says."""

import json
import os
import re
import subprocess
import tempfile
import unittest
from functools import cache
from pathlib import Path

from scripts import building

PRIVATE_MOUNTS = ["unshare", "--mount"] + ([] if os.geteuid() == 0 else ["--map-root-user"])
PROGRAM = building.BUILD / "native/cli/sentrova"
CLI = building.ROOT / "cli"
MAN_PAGE = CLI / "man/sentrova.8"

BASH = r"""
source "$1"
shift
[[ $(complete -p sentrova) == "complete -F _sentrova sentrova" ]] || exit 1
compopt() { :; }
COMP_WORDS=("$@") COMP_CWORD=$(($# - 1))
_sentrova sentrova
printf '%s\n' "${COMPREPLY[@]}"
"""

# Types each line of the file $2 and Tab into a shell; what it takes as matches goes to the file $3,
# the lines' matches parted by a line "end".
ZSH = r"""
zmodload zsh/zpty
zpty shell zsh -f -i
zpty -w shell "fpath=($1 \$fpath); matches=$3; source $4"
while IFS= read -r line; do
  zpty -w -n shell $line$'\t'
  zpty -r -m shell output '*<complete>*' || exit 1
done <$2
"""
ZSH_SHELL = r"""
autoload -U compinit && compinit -D -u
compadd() {
  if [[ ${@[1,(i)(-|--)]} != *-(O|A|D)\ * ]]; then
    local -a __matches
    builtin compadd -A __matches "$@"
    (( $#__matches )) && print -rl -- $__matches >>$matches
  fi
  builtin compadd "$@"
}
capture() {
  zle complete-word
  print end >>$matches
  BUFFER=
  print '<complete>'
}
zle -N capture
bindkey '^I' capture
"""

# Runs a command in the folder $1/work under a private root, which has the device's files from
# $1/device and two volumes mounted.
PRIVATE_ROOT = r"""
root=$1/root
mkdir -p "$root"
mount -t tmpfs tmpfs "$root"
cp -r "$1/device/." "$root"
for path in /bin /lib /lib64 /usr /dev /proc "$1" "$2"; do
  [ -e "$path" ] || continue
  if [ -L "$path" ]; then cp -P "$path" "$root"; continue; fi
  mkdir -p "$root$path"
  mount --rbind "$path" "$root$path"
done
mkdir "$root/data" "$root/logs"
mount -t tmpfs /dev/block/sda1 "$root/data"
mount -t tmpfs logs "$root/logs"
folder=$1
shift 2
exec chroot "$root" env -C "$folder/work" "$@"
"""

FSTAB = """# /dev/block/sda9 /comment ext4 ro wait
/dev/block/sda1\t/data f2fs noatime wait,check
  /dev/block/sda1 /data ext4 noatime wait
#/dev/block/sda8 /old ext4 ro wait
system /system erofs ro logical
/dev/block/sda2 /data2 ext4 ro wait
/dev/block/sda3 / ext4 ro wait
/dev/block/zram0 none swap defaults defaults
"""
MOUNTABLE = {"/data", "/data2", "/system", "/cache", "/otg", "/sdcard"}

# What each device has besides its root, and what the verbs' mount points are completed to there.
PROPERTY = {"etc/properties/ro.hardware": "zuno"}
GETPROP = {"tools/getprop": '#!/bin/sh\n[ "$*" = ro.hardware ] && echo zuno'}
DEVICES: list[tuple[dict[str, str], dict[str, set[str]]]] = [
    ({**PROPERTY, "etc/recovery.fstab": FSTAB, "vendor/etc/fstab.zuno": ""},
     {"mount ": MOUNTABLE, "mount /da": {"/data", "/data2"}, "mount /data ": set(),
      "--user 10 --json format /": {"/data", "/data2", "/cache"},
      "--user=10 format --yes --from one /c": {"/cache"}}),
    ({**PROPERTY, "vendor/etc/fstab.zuno": FSTAB}, {"mount ": MOUNTABLE}),
    ({**GETPROP, "vendor/etc/fstab.zuno": FSTAB}, {"mount ": MOUNTABLE}),
    ({**PROPERTY, "vendor/etc/fstab.other": FSTAB},
     {"mount ": set(), "format ": set(), "unmount --force /d": {"/data"},
      "holders /da": {"/data"}, "holders /log": set()}),
]

# What a line is completed to, in a folder with the directory "one" and the file "other". Options do
# not count: zsh offers them where an argument is not known.
LINES: dict[str, set[str]] = {
    "verify ": set(),
    "format --from o": {"one"},
    "format --from=o": {"one"},
    "find o": set(),
    "find name o": {"one"},
    "blockmap o": {"one", "other"},
    "blockmap -o o": {"one", "other"},
    "unlock --method f": {"fbe", "fde"},
    "unlock --method=a": {"auto"},
    "unlock --user ": set(),
    "properties load ": set(),
    "reboot ": {"recovery", "bootloader"},
}

# Command lines that cannot be used, with what the message says and the verb whose help it names.
WRONG_LINES = [
    ("", "a verb is missing or unknown", ""),
    ("nosuch --help", "a verb is missing or unknown", ""),
    ("datadump nosuch --help", "a verb is missing or unknown", "datadump"),
    ("--user", "--user", ""),
    ("--user -1 status", "a user id is a number", "status"),
    ("find --user 1x", "a user id is a number", "find"),
    ("find name", "directory is required", "find"),
    ("mount --secret /data", "not expected", "mount"),
    ("verify secret", "never taken from the command line", "verify"),
    ("datadump status secret --help", "not expected", "datadump status"),
]


@cache
def help_of(verb: str) -> str:
    command = [str(PROGRAM), *verb.split(), "--help"]
    return subprocess.run(command, capture_output=True, text=True, check=True).stdout


def names_in(section: str, verb: str) -> set[str]:
    """The first words of a section's lines, which may be several names."""
    found = re.search(rf"^{section}:\n((?:  .*\n)+)", help_of(verb), re.MULTILINE)
    lines = re.findall(r"^  (\S+)", found[1], re.MULTILINE) if found else []
    return {name for line in lines for name in line.split(",")}


def options_by_verb() -> dict[str, set[str]]:
    """Each verb with its own options; "" with those that all of them take, and "properties" and
    the like, which are no verbs by themselves, with none."""
    options = {"": names_in("Options", "")}
    waiting = [""]
    for verb in waiting:  # which grows
        for name in names_in("Verbs", verb):
            nested = f"{verb} {name}".strip()
            options[nested] = names_in("Options", nested) - options[""]
            waiting.append(nested)
    return options


def options_in_man_page() -> dict[str, set[str]]:
    options: dict[str, set[str]] = {"": set()}
    for line in re.findall(r"^\.It ((?:Cm|Fl) .*)", MAN_PAGE.read_text(), re.MULTILINE):
        found = re.match(r"Cm ((?:[a-z][a-z-]* ?)+)", line)
        names = options.setdefault(found[1].strip() if found else "", set())
        names.update("--" + name for name in re.findall(r"Fl Fl (\S+)", line))
        names.update("-" + name for name in re.findall(r"Fl (\w)\b", line))
    return options


class Shells:
    """A folder to complete in, in a root with the given files if there are any. The program must
    not be run."""

    def __init__(self, folder: str, device: dict[str, str]) -> None:
        self.folder, self.tools = Path(folder, "work"), Path(folder, "device/tools")
        (self.folder / "one").mkdir(parents=True)
        (self.folder / "other").touch()
        self.tools.mkdir(parents=True)
        self.ran = self.folder / "ran"
        self.root: list[object] = []
        files = {"tools/sentrova": f"#!/bin/sh\n: >'{self.ran}'\n", **device}
        for name, text in files.items():
            path = Path(folder, "device", name)
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_text(text)
            path.chmod(0o755)
        if device:
            self.root = [*PRIVATE_MOUNTS, "sh", "-euc", PRIVATE_ROOT, "sh", folder, CLI]

    def run(self, *command: object) -> str:
        environment = {"PATH": f"{self.tools}:{os.environ['PATH']}", "TERM": "dumb",
                       "ANDROID_PROPERTY_DIR": "/etc/properties"}
        result = subprocess.run(
            [str(part) for part in (*self.root, *command)], cwd=self.folder, env=environment,
            stdin=subprocess.DEVNULL, capture_output=True, text=True, timeout=60, check=True,
        )
        if result.stderr or self.ran.exists():
            raise AssertionError(result.stderr or "the program was run")
        return result.stdout

    def bash(self, lines: list[str]) -> list[set[str]]:
        found = []
        for line in lines:
            words = re.findall(r"=|[^ =]+|(?<= )$", f"sentrova {line}")
            script = CLI / "completions/bash/sentrova"
            found.append(set(self.run("bash", "-c", BASH, "bash", script, *words).split("\n")))
        return [matches - {""} for matches in found]

    def zsh(self, lines: list[str]) -> list[set[str]]:
        typed, matches, shell = (self.tools / name for name in ("typed", "matches", "shell"))
        typed.write_text("".join(f"sentrova {line}\n" for line in lines))
        shell.write_text(ZSH_SHELL)
        self.run("zsh", "-f", "-c", ZSH, "zsh", CLI / "completions/zsh", typed, matches, shell)
        return [set(part.split("\n")) - {""} for part in matches.read_text().split("end\n")[:-1]]


class CommandLine(unittest.TestCase):
    maxDiff = None

    @classmethod
    def setUpClass(cls) -> None:
        building.build_preset("native", "sentrova")

    def check_completions(self, expected: dict[str, set[str]], device: dict[str, str]) -> None:
        for shell in (Shells.bash, Shells.zsh):
            with tempfile.TemporaryDirectory() as folder:
                found = dict(zip(expected, shell(Shells(folder, device), list(expected))))
            for line, matches in found.items():
                if not line.endswith("-"):
                    found[line] = {match for match in matches if not match.startswith("-")}
            self.assertEqual(found, expected, shell.__name__)

    def test_completions_know_all_verbs_and_options(self) -> None:
        options = options_by_verb()
        expected = {f"{verb} -".lstrip(): own | options[""] for verb, own in options.items()}
        expected |= {f"{verb} ".lstrip(): names for verb in options
                     if (names := names_in("Verbs", verb))}
        self.assertGreater(len(expected), 20)
        self.check_completions(expected, {})

    def test_completions_of_arguments(self) -> None:
        self.check_completions(LINES, {})

    def test_completions_of_mount_points(self) -> None:
        if subprocess.run([*PRIVATE_MOUNTS, "true"], capture_output=True, check=False).returncode:
            self.skipTest("no private mounts here")
        for device, expected in DEVICES:
            self.check_completions(expected, device)

    def test_wrong_command_lines(self) -> None:
        for line, message, verb in WRONG_LINES:
            with self.subTest(line=line):
                result = subprocess.run([str(PROGRAM), "--json", *line.split()], check=False,
                                        capture_output=True, text=True, timeout=60)
                error = json.loads(result.stdout)["error"]
                self.assertEqual((result.returncode, result.stderr), (2, f"sentrova: {error}\n"))
                self.assertIn(message, error)
                self.assertIn(f"`{f'sentrova {verb}'.strip()} --help`", error)
                self.assertNotIn("secret", error)

    def test_man_page(self) -> None:
        groups = {verb for verb in options_by_verb() if verb and names_in("Verbs", verb)}
        verbs = {verb: own for verb, own in options_by_verb().items() if verb not in groups}
        self.assertEqual(options_in_man_page(), verbs)
        statuses = re.findall(r"^\.It (\d)\n([^.]*)\.$", MAN_PAGE.read_text(), re.MULTILINE)
        self.assertEqual(
            {(status, " ".join(meaning.lower().split())) for status, meaning in statuses},
            set(re.findall(r"^  (\d)  (.*)$", help_of(""), re.MULTILINE)),
        )
        lint = subprocess.run(["mandoc", "-T", "lint", "-W", "warning", str(MAN_PAGE)],
                              capture_output=True, text=True, check=False)
        self.assertEqual(lint.stdout + lint.stderr, "")
