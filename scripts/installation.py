"""What a person who installs the project gets: an installed tree and the Debian packages, each built
against and run where it stands, with nothing of the build folder."""

from __future__ import annotations

import os
import subprocess
import tempfile
from concurrent.futures import ThreadPoolExecutor
from pathlib import Path

from scripts.building import BUILD, ROOT, build_preset, run_step
from scripts.tally import Tally

NATIVE = BUILD / "native"
VENDOR_LIBRARY = "libzunogatekeeper.so"


def run(*command: str | Path, **environment: str) -> tuple[int, str]:
    """A command's exit status and what it printed; the library path of this shell does not count."""
    clean = {name: value for name, value in os.environ.items() if name != "LD_LIBRARY_PATH"}
    result = subprocess.run(
        [str(word) for word in command], env={**clean, **environment}, stdin=subprocess.DEVNULL,
        stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, errors="replace", check=False)
    return result.returncode, result.stdout


def only(folder: Path, pattern: str) -> Path:
    found = sorted(folder.glob(pattern))
    assert len(found) == 1, f"{pattern} in {folder}: {found}"
    return found[0]


def flags_of(prefix: Path, package: str, *options: str) -> list[str]:
    folder = only(prefix, "lib/*/pkgconfig")
    status, output = run("pkg-config", *options, package, PKG_CONFIG_PATH=str(folder))
    assert status == 0, output
    return output.split()


def check_headers(prefix: Path) -> Tally:
    """Each header, compiled alone by what pkg-config says, for the program of a loader or a client."""
    include = prefix / "include/sentrova"
    flags = flags_of(prefix, "sentrova-service-impl", "--cflags")
    warnings = ["-std=c++20", "-Wall", "-Wextra", "-Werror"]

    def compile_alone(header: Path) -> tuple[int, str]:
        return run("g++", *warnings, *flags, "-fsyntax-only", "-x", "c++", "-include", header,
                   "/dev/null")

    headers = sorted(path for path in include.rglob("*.h"))
    tally = Tally()
    with ThreadPoolExecutor(os.cpu_count()) as pool:
        for header, (status, output) in zip(headers, pool.map(compile_alone, headers)):
            tally.add_check(f"{header.relative_to(include)} alone\n{output}", status == 0)
    tally.add_check("there are headers", len(headers) > 0)
    return tally


def check_prefix(work: Path) -> Tally:
    """`cmake --install` under a prefix, used through pkg-config after the tree was moved."""
    staged, prefix = work / "staged", work / "moved"
    install = ["cmake", "--install", str(NATIVE), "--prefix", str(staged)]
    run_step("install", install)
    tally = Tally()
    tally.add_check("stand-ins are installed only when asked for",
                    not list(staged.rglob(VENDOR_LIBRARY)))
    run_step("install stand-ins", [*install, "--component", "standins"])
    staged.rename(prefix)
    tally.add(check_headers(prefix))

    properties = work / "properties"
    properties.mkdir()
    for package, source, environment in (
        ("sentrova-service-impl", "tests/installed/units.cpp",
         {"ANDROID_PROPERTY_DIR": str(properties)}),
        ("sentrova-service", "examples/client.cpp", None),
        ("sentrova-service-impl", "examples/host.cpp", None),
    ):
        program = work / Path(source).stem
        status, output = run("g++", "-std=c++20", ROOT / source, "-o", program,
                             *flags_of(prefix, package, "--cflags", "--libs"))
        tally.add_check(f"{source} by pkg-config\n{output}", status == 0)
        # The examples would talk to this machine's binder driver.
        if environment is not None and status == 0:
            status, output = run(program, properties, **environment)
            tally.add_check(f"{program.name} runs\n{output}", status == 0)
    return tally


def check_packages(work: Path) -> Tally:
    """The Debian packages, unpacked into a clean folder, used through find_package."""
    run_step("packages", ["cpack", "--config", str(NATIVE / "CPackConfig.cmake"), "-B", str(work)])
    root = work / "root"
    for name in ("sentrova", "sentrova-dev"):
        run("dpkg-deb", "-x", only(work, f"{name}_*.deb"), root)
    tally = Tally()

    build = work / "examples"
    status, output = run("cmake", "-S", only(root, "usr/share/doc/*/examples"), "-B", build,
                         f"-DCMAKE_PREFIX_PATH={root}/usr", "-G", "Ninja")
    if status == 0:
        status, output = run("cmake", "--build", build)
    tally.add_check(f"the examples by find_package\n{output}", status == 0)
    # The dynamic linker finds all but the vendor's libraries, of which the project has none to give.
    client = root / "usr/bin/sentrova"
    status, output = run(client, "--help")
    tally.add_check(f"sentrova without {VENDOR_LIBRARY}: {status}\n{output}",
                    status == 127 and VENDOR_LIBRARY in output)
    run("dpkg-deb", "-x", only(work, "sentrova-standins_*.deb"), root)
    status, output = run(client, "--help")
    tally.add_check(f"sentrova --help: {status}\n{output}",
                    status == 0 and "Usage: sentrova" in output)
    for program in (build / "example_host", build / "example_client",
                    root / "usr/libexec/sentrova/servicemanager"):
        status, output = run("ldd", program)
        tally.add_check(f"{program.name} finds its libraries\n{output}",
                        status == 0 and "not found" not in output and str(root) in output)
    return tally


def run_installation() -> Tally:
    build_preset("native", "installables")
    tally = Tally()
    for check in (check_prefix, check_packages):
        with tempfile.TemporaryDirectory(prefix="sentrova-install-") as work:
            tally.add(check(Path(work)))
    return tally
