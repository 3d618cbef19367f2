"""Prints the files of kernel modules in loading order, each after those that it depends on.

usage: module_order.py MODULES_FOLDER NAME...

MODULES_FOLDER is lib/modules/VERSION with the modules.dep that depmod writes and the
modules.builtin of the kernel's package. A name that the kernel has built in is left out. Exit
status 1 when a name is neither.
"""

import re
import sys
from pathlib import Path


def module_name(path: str) -> str:
    """The name of a module file; the kernel takes '-' and '_' as the same."""
    return re.sub(r"\.ko(\.\w+)?$", "", path.rsplit("/", 1)[-1]).replace("-", "_")


def loading_order(dependencies: dict[str, list[str]], wanted: list[str]) -> list[str]:
    """WANTED files with all they need; `dependencies` maps a file to the files that it needs."""
    order: dict[str, None] = {}

    def visit(path: str) -> None:
        if path in order:
            return
        for needed in dependencies[path]:
            visit(needed)
        order[path] = None

    for path in wanted:
        visit(path)
    return list(order)


def main() -> int:
    folder, names = Path(sys.argv[1]), sys.argv[2:]
    dependencies: dict[str, list[str]] = {}
    for line in (folder / "modules.dep").read_text().splitlines():
        path, _, needed = line.partition(":")
        dependencies[path] = needed.split()
    files = {module_name(path): path for path in dependencies}
    builtin = {module_name(path) for path in (folder / "modules.builtin").read_text().split()}

    wanted = []
    for name in names:
        key = name.replace("-", "_")
        if key in files:
            wanted.append(files[key])
        elif key not in builtin:
            print(f"the kernel has no module {name}", file=sys.stderr)
            return 1
    print("\n".join(loading_order(dependencies, wanted)))
    return 0


if __name__ == "__main__":
    sys.exit(main())
