"""What is put into a handset from the PC: the daemon of a build, its libraries, init's modules."""

import compileall
import re
import shutil
import sys
from dataclasses import dataclass
from functools import lru_cache
from pathlib import Path

from amt_simulator.errors import HandsetError
from amt_simulator.tree import ROOT

PROJECT = Path(__file__).resolve().parent.parent
IS_TREE = (PROJECT / "CMakePresets.json").is_file()
# Where the presets' builds lie: in an installation, what it was given when it was packaged.
BUILDS = PROJECT / "build" if IS_TREE else Path(__file__).with_name("builds")
DAEMON = "vx-kel-amt"
PRELOAD = "libhandset-devices.so"
LIBRARIES = {
    "liblog.so": "system/lib", "libcutils.so": "system/lib", "libldt.so": "system/lib",
    PRELOAD: "system/lib", "amt.tq5530.misc.so": "system/lib/hw",
    "audio.primary.tq5530.amt.so": "system/lib/hw",
}
PROGRAMS = ("amt-audio", "sync")
# What of a build a handset needs, in the build's directory.
PARTS = (f"bin/{DAEMON}", *(f"bin/{name}" for name in PROGRAMS),
         *(f"lib/{name}" for name in LIBRARIES))
# Init's modules, and the wire codec that its modem speaks; each in a package that is empty inside.
MODULES = ("amt_simulator/inside", "amt_station/wire")
COVERAGE = b".gcda\0"
SANITIZER = re.compile(rb"lib([at])san\.so\.\d+\0")

# In the handset, and on the PC beside the root.
INSIDE = "/run/handset"
MODULE_DIRECTORY = "modules"
DAEMON_COPY = "daemon"


@dataclass(frozen=True)
class Program:
    """The daemon to run: the program itself and, when it comes from a build, what belongs to it."""

    daemon: Path
    build: Path | None
    # What it is instrumented with: a sanitizer, and the counting of what is run.
    sanitizer: str = ""
    counts_coverage: bool = False

    @property
    def no_randomize(self) -> bool:
        """Whether it runs only at fixed addresses: the shadow of that sanitizer has its place."""
        return self.sanitizer == "tsan"

    @property
    def tells_at_exit(self) -> bool:
        """Whether its end must be a proper one, because only then it tells what it has found."""
        return bool(self.sanitizer) or self.counts_coverage

    @property
    def has_preload(self) -> bool:
        """Whether the library that answers device requests comes with it."""
        return self.build is not None


def build_directory(build: "str | Path") -> Path:
    """The directory of a build: a preset's name, or a directory."""
    return build if isinstance(build, Path) else BUILDS / build


def _absent(path: Path, what: str) -> HandsetError:
    """What is wrong where a file of a build is not there, and what to do."""
    if IS_TREE:
        return HandsetError(f"{path} is not there; ./dev build makes {what}")
    return HandsetError(f"{path} is not there: the wheel for a platform and the Debian package "
                        "bring the build release, and --build takes the directory of another")


def find_program(build: "str | Path | None", daemon: Path | None) -> Program:
    """Find the daemon of a build, or take another program in its place."""
    directory = build_directory(build) if build is not None else None
    if daemon is None:
        if directory is None:
            raise HandsetError("neither a build nor a daemon was given")
        daemon = directory / "bin" / DAEMON
    if not daemon.is_file():
        raise _absent(daemon, f"the build {directory.name if directory else ''}".rstrip())
    content = daemon.read_bytes()
    match = SANITIZER.search(content)
    return Program(daemon, directory, {b"a": "asan", b"t": "tsan"}[match[1]] if match else "",
                   directory is not None and COVERAGE in content)


def _part(build: Path, place: str, name: str) -> Path:
    """A file that belongs to the daemon of a build."""
    path = build / place / name
    if not path.is_file():
        raise _absent(path, f"all of the build {build.name}")
    return path


def _copy(source: Path, target: Path) -> None:
    target.parent.mkdir(parents=True, exist_ok=True)
    shutil.copy2(source, target)


def install(directory: Path, program: Program) -> None:
    """Copy everything into the handset's directory: a build may change while the handset is up."""
    daemon = directory / DAEMON_COPY
    _copy(program.daemon, daemon)
    daemon.chmod(0o755)
    root = directory / ROOT
    if program.build is not None:
        for name, place in LIBRARIES.items():
            _copy(_part(program.build, "lib", name), root / place / name)
        for name in PROGRAMS:
            _copy(_part(program.build, "bin", name), root / "system/bin" / name)
    modules = directory / MODULE_DIRECTORY
    for source in _modules():
        _copy(source, modules / source.relative_to(PROJECT))
    for name in MODULES:
        (modules / name).parent.joinpath("__init__.py").touch()


@lru_cache(maxsize=1)
def _modules() -> list[Path]:
    """The modules to copy, compiled: so each handset's init does not have to do it again."""
    if not sys.dont_write_bytecode:
        # Where nothing may be written, the sources are there all the same.
        for name in MODULES:
            compileall.compile_dir(PROJECT / name, quiet=2)
    return [source for name in MODULES for source in (PROJECT / name).rglob("*.py*")]


def sanitizer_environment() -> dict[str, str]:
    """What a sanitizer build needs: reports to files, and its place behind the preload library."""
    # One log text has a conversion that no C library knows; it is no finding.
    log = "log_path=/handset/sanitizer:check_printf=0"
    return {"ASAN_OPTIONS": f"verify_asan_link_order=0:{log}", "TSAN_OPTIONS": log,
            "UBSAN_OPTIONS": f"print_stacktrace=1:{log}", "LSAN_OPTIONS": log}
