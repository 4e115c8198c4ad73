"""Build what the users of the project install, in build/package: `./dev package`."""

import argparse
import os
import tempfile
from contextlib import ExitStack
from pathlib import Path
from typing import Callable, Sequence

from amt_simulator.errors import HandsetError
from tools.package import bundle, debian, fresh_root, python
from tools.package.handset_build import HandsetBuild, made
from tools.package.source import EPOCH, PackageFailed, epoch, publish
from tools.project import PROJECT, die, note, say

KINDS = {
    "wheel": "the Python packages, for every system, and their source archive",
    "platform": "the same as a wheel with the release build of the daemon and its stand-ins",
    "debian": "the Debian package amt-station, looked at by lintian",
    "bundle": "what goes onto a handset, with a manifest",
}


class Packager:
    """Makes the kinds, each in a directory of its own that does not outlive it."""

    def __init__(self, into: Path, build: str) -> None:
        self._into = into
        self._build_name = build
        self._builds: list[HandsetBuild] = []
        self._stack = ExitStack()
        into.mkdir(parents=True, exist_ok=True)

    def __enter__(self) -> "Packager":
        return self

    def __exit__(self, *_error: object) -> None:
        self._stack.close()

    def build(self) -> HandsetBuild:
        """The build whose daemon is carried, made when it is first wanted."""
        if not self._builds:
            work = tempfile.TemporaryDirectory(prefix=".build-", dir=self._into)
            self._builds.append(made(self._build_name, Path(self._stack.enter_context(work))))
        return self._builds[0]

    def make(self, kind: str) -> list[Path]:
        """Make one kind, and put it where it is looked for."""
        makers: dict[str, Callable[[Path], list[Path]]] = {
            "wheel": python.make_pure,
            "platform": lambda work: python.make_platform(work, self.build()),
            "debian": debian.make,
            "bundle": lambda work: bundle.make(work, self.build()),
        }
        log = self._into / f"{kind}.log"
        log.unlink(missing_ok=True)
        say(f"packaging: {kind}")
        try:
            with tempfile.TemporaryDirectory(prefix=f".{kind}-", dir=self._into) as work:
                return publish(makers[kind](Path(work)), self._into)
        except PackageFailed as failed:
            if not failed.said:
                raise
            log.write_text(failed.said, "utf-8")
            raise PackageFailed(f"{failed}; all of it: {log}") from None


def make_all(kinds: Sequence[str], into: Path, build: str) -> list[Path]:
    """Make some kinds, and name each file as soon as it is there."""
    found = []
    with Packager(into, build) as packager:
        for kind in kinds:
            for path in packager.make(kind):
                print(path, flush=True)
                found.append(path)
    return found


def check(kinds: Sequence[str], found: Sequence[Path], build: str) -> None:
    """Make all of it again, compare it, and try the Debian package in a fresh Debian."""
    with tempfile.TemporaryDirectory(prefix="package-again-") as folder:
        for path in make_all(kinds, Path(folder), build):
            (first,) = [other for other in found if other.name == path.name]
            if first.read_bytes() != path.read_bytes():
                raise PackageFailed(f"{path.name} is not the same when it is made again")
    note("made again, all of it is the same")
    for path in found:
        if path.suffix == ".deb":
            fresh_root.check(path)


def main() -> int:
    """Make what was asked for, and name it."""
    parser = argparse.ArgumentParser(
        prog="./dev package", description=__doc__,
        formatter_class=argparse.RawDescriptionHelpFormatter,
        epilog="kinds:\n" + "\n".join(f"  {name:10} {text}" for name, text in KINDS.items()))
    parser.add_argument("kind", nargs="*", metavar="KIND",
                        help=f"{', '.join(KINDS)} (default: all)")
    parser.add_argument("--build", default="release", metavar="PRESET|DIRECTORY/",
                        help="whose daemon the platform's wheel and the bundle carry: a preset, "
                        "which is built, or a build's directory (default: %(default)s)")
    parser.add_argument("--into", type=Path, default=PROJECT / "build" / "package", metavar="DIR",
                        help="where the packages are put (default: build/package)")
    parser.add_argument("--check", action="store_true",
                        help="also make each again and compare; and install the Debian package in "
                        "a fresh Debian, try it and remove it (needs root, the network, minutes)")
    options = parser.parse_args()
    for kind in options.kind:
        if kind not in KINDS:
            parser.error(f"no such kind: {kind} (there are: {', '.join(KINDS)})")
    kinds = [kind for kind in KINDS if kind in options.kind or not options.kind]
    try:
        # Compilers and tools that write a time take this one.
        os.environ[EPOCH] = str(epoch())
        found = make_all(kinds, options.into.resolve(), options.build)
        if options.check:
            check(kinds, found, options.build)
    except (PackageFailed, HandsetError, OSError) as error:
        die(str(error))
    return 0
