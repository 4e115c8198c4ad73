"""The build of which the packages carry the daemon, and its files as they ship: stripped."""

import re
from dataclasses import dataclass
from pathlib import Path

from amt_simulator.program import DAEMON, PARTS, find_program
from tools.build import PRESETS
from tools.package.source import PackageFailed, put, run
from tools.project import PROJECT, say

STRIP = re.compile(r"^CMAKE_STRIP:FILEPATH=(.+)$", re.MULTILINE)
# A build for a handset has no stand-ins.
TARGETS = {"android": DAEMON}


@dataclass(frozen=True)
class HandsetBuild:
    """A build's directory."""

    folder: Path

    @property
    def daemon(self) -> Path:
        """The daemon of the build."""
        return self.folder / "bin" / DAEMON

    @property
    def strip(self) -> str:
        """The program that takes the names out of what this build's compiler has made."""
        cache = self.folder / "CMakeCache.txt"
        found = STRIP.search(cache.read_text("utf-8")) if cache.is_file() else None
        return found[1] if found else "strip"

    def put_stripped(self, name: str, target: Path, mode: int) -> None:
        """Copy a file of the build without the names that only a debugger wants."""
        source = self.folder / name
        if not source.is_file():
            raise PackageFailed(f"{source} is not there; a handset needs all of its build")
        put(source, target, mode)
        run([self.strip, "--strip-unneeded", str(target)], target.parent)

    def put_all(self, into: Path) -> list[Path]:
        """Copy all that a simulated handset needs."""
        for name in PARTS:
            self.put_stripped(name, into / name, 0o755 if name.startswith("bin/") else 0o644)
        return [into / name for name in PARTS]


def _check(found: HandsetBuild) -> HandsetBuild:
    """Refuse what no handset and no station is given."""
    if find_program(found.folder, None).tells_at_exit:
        raise PackageFailed(f"{found.daemon} is instrumented for tests")
    return found


def made(name: str, work: Path) -> HandsetBuild:
    """A build of a preset, made now and of nothing that lies about; or one that is there already.

    The time that the daemon tells as that of its build is the commit's.
    """
    if "/" not in name and name not in PRESETS:
        raise PackageFailed(f"{name} is no preset ({', '.join(PRESETS)}); a directory has a slash")
    if name in PRESETS:
        say(f"building {name}")
        run(["cmake", "--preset", name, "-B", str(work), "-DVX_TESTS=OFF", "-DVX_BENCH=OFF"],
            PROJECT)
        run(["cmake", "--build", str(work), "--target", TARGETS.get(name, "handset")], PROJECT)
        return _check(HandsetBuild(work))
    if not Path(name).is_dir():
        raise PackageFailed(f"{name} is not there")
    return _check(HandsetBuild(Path(name).resolve()))
