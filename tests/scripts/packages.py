"""What the tests of the packages share: the command, and a root to install into."""

from __future__ import annotations

import os
import shutil
import subprocess
import sys
import sysconfig
from pathlib import Path

PROJECT = Path(__file__).resolve().parents[2]
# Only a machine that stands still takes so long: a package is compiled, beside builds and tests.
SECONDS = 3600

# Whose the links of the root are: what nobody has, dpkg takes away with the last package in it.
EVERYBODYS = """Package: base-files
Status: install ok installed
Maintainer: nobody <nobody@localhost>
Architecture: all
Version: 1
Description: what is everybody's

"""

Done = subprocess.CompletedProcess


def run(*words: str | Path, cwd: Path, **environment: str) -> "Done[str]":
    """Run a program as somebody would who has nothing to do with the project."""
    kept = {name: value for name, value in os.environ.items()
            if not name.startswith(("AMT_", "HANDSET_DIR", "PYTHON", "XDG_"))}
    return subprocess.run([str(word) for word in words], cwd=cwd, env={**kept, **environment},
                          capture_output=True, text=True, timeout=SECONDS, check=False,
                          stdin=subprocess.DEVNULL)


def package(*words: str | Path, **environment: str) -> "Done[str]":
    """Run the command that makes packages."""
    return run(sys.executable, "-P", "-m", "tools", "package.main", *words, cwd=PROJECT,
               PYTHONPATH=str(PROJECT), **environment)


class BareRoot:
    """A directory that a sandbox has as its root: Python, dpkg and the libraries, nothing else.

    What the system has is looked at, at places of its own; what is installed lies in the directory.
    """

    OF_THE_SYSTEM = {
        "/usr/bin": "/usr/host/bin", "/usr/sbin": "/usr/host/sbin",
        "/usr/lib/python3/dist-packages": "/usr/host/packages",
        "/usr/share/dpkg": "/usr/share/dpkg", "/usr/share/python3": "/usr/share/python3",
        "/usr/share/zoneinfo": "/usr/share/zoneinfo", "/usr/lib64": "/usr/lib64",
    }
    # Called by their whole path, or asked where they lie.
    PYTHON = f"python{sys.version_info[0]}.{sys.version_info[1]}"
    COPIED = (PYTHON, "sh", "env", "dpkg", "dpkg-query")

    def __init__(self, root: Path) -> None:
        self.root = root
        multiarch = str(sysconfig.get_config_var("MULTIARCH"))
        stdlib = f"/usr/lib/{self.PYTHON}"
        libraries = f"/usr/lib/{multiarch}"
        self._binds = {**self.OF_THE_SYSTEM, stdlib: stdlib, libraries: libraries}
        for name in ("usr/bin", "usr/sbin", "usr/lib/python3/dist-packages", "var/lib/dpkg/info",
                     "var/lib/dpkg/updates", "var/lib/dpkg/triggers", "tmp", "etc", "var/log",
                     *(place.lstrip("/") for place in self._binds.values())):
            (root / name).mkdir(parents=True, exist_ok=True)
        for name in ("bin", "sbin", "lib", "lib64"):
            (root / name).symlink_to(f"usr/{name}")
        for name in self.COPIED:
            shutil.copy(f"/usr/bin/{name}", root / "usr/bin" / name)
        (root / "usr/bin/python3").symlink_to(self.PYTHON)
        (root / "var/lib/dpkg/status").write_text(EVERYBODYS)
        (root / "var/lib/dpkg/info/base-files.list").write_text("/.\n/bin\n/lib\n/lib64\n/sbin\n")
        (root / "usr/lib/python3/dist-packages/system.pth").write_text("/usr/host/packages\n")

    def enter(self, *words: str) -> "Done[str]":
        """Run a command as the root of this root."""
        binds = [word for source, place in self._binds.items() if Path(source).is_dir()
                 for word in ("--ro-bind", source, place)]
        return run("bwrap", "--bind", self.root, "/", *binds, "--dev", "/dev", "--dev-bind",
                   "/proc", "/proc", "--unshare-user", "--uid", "0", "--gid", "0", "--cap-add",
                   "ALL", "--die-with-parent", *words, cwd=self.root, HOME="/tmp",
                   PATH="/usr/bin:/usr/sbin:/usr/host/bin:/usr/host/sbin")
