"""The daemon for 32-bit Arm: what it links, and its unit tests under emulation: `./dev cross`."""

import argparse
import os
import shutil
import subprocess
import tempfile
from pathlib import Path

from tools.build import build
from tools.ctest import run_ctest
from tools.project import PROJECT, note, say

BUILD = PROJECT / "build" / "armhf"
SYSROOT = PROJECT / "build" / "armhf-sysroot"

# What the cross compiler's own packages do not bring: the target's zlib and GoogleTest.
PACKAGES = ("zlib1g", "zlib1g-dev", "libgtest-dev", "libgmock-dev")

TEST_SECONDS = "120"

MIRROR = "http://deb.debian.org/debian/"
KEYRING = "/usr/share/keyrings/debian-archive-keyring.gpg"


# Tests that cannot say anything under emulation, and why.
LEFT_OUT = {
    r"^platform\.devices_test\.": "start a program of their own, which is Arm code again",
    r"^platform\.programs_test\.": "start the stand-in programs",
    r"_death_test\.": "start themselves again",
    r"^pub\..*serial_speed.*/(460801|3000000|2147483647)$": "the emulator does not know B921600",
}


def release() -> str:
    """The code name of the Debian release that this machine runs."""
    lines = Path("/etc/os-release").read_text().splitlines()
    names = dict(line.split("=", 1) for line in lines if "=" in line)
    return names.get("VERSION_CODENAME", "bookworm").strip('"')


def mirror(codename: str) -> str:
    """The mirror from which this machine gets its packages."""
    listed = subprocess.run(
        ["apt-get", "indextargets", "--format", "$(REPO_URI) $(RELEASE)", "Created-By: Packages"],
        check=False, capture_output=True, text=True).stdout
    for line in listed.splitlines():
        uri, _, name = line.partition(" ")
        if name == codename and "debian" in uri:
            return uri
    return MIRROR


def apt_options(state: Path) -> list[str]:
    """An apt of its own for the target's packages: the machine's stays as it is."""
    codename = release()
    (state / "sources.list").write_text(
        f"deb [signed-by={KEYRING}] {mirror(codename)} {codename} main\n")
    for name in ("lists/partial", "archives/partial"):
        (state / name).mkdir(parents=True)
    (state / "status").touch()
    settings = {
        "APT::Architecture": "armhf", "APT::Architectures::": "armhf",
        "APT::Sandbox::User": "root" if os.getuid() == 0 else "",
        "Acquire::Languages": "none",
        "Dir::Etc::SourceList": state / "sources.list", "Dir::Etc::SourceParts": "-",
        "Dir::State::Lists": state / "lists", "Dir::State::Status": state / "status",
        "Dir::Cache": state, "Dir::Cache::Archives": state / "archives",
    }
    return ["-q"] + [word for key, value in settings.items() for word in ("-o", f"{key}={value}")]


def unpack(package: Path, root: Path) -> None:
    """Unpack a package below a root of its own, where its absolute links have to stay within."""
    subprocess.run(["dpkg-deb", "-x", package, root], check=True)
    for path in root.rglob("*"):
        if path.is_symlink() and os.path.isabs(os.readlink(path)):
            target = root / os.readlink(path).lstrip("/")
            path.unlink()
            path.symlink_to(os.path.relpath(target, path.parent))


def make_sysroot() -> None:
    """Fetch the target's libraries, once; needs no privilege."""
    if SYSROOT.exists():
        return
    say(f"fetching for armhf: {' '.join(PACKAGES)}")
    SYSROOT.parent.mkdir(exist_ok=True)
    with tempfile.TemporaryDirectory(dir=SYSROOT.parent, prefix="armhf-") as name:
        state = Path(name)
        options = apt_options(state)
        subprocess.run(["apt-get", *options, "update"], check=True, stdout=subprocess.DEVNULL)
        subprocess.run(["apt-get", *options, "download", *PACKAGES], check=True, cwd=state,
                       stdout=subprocess.DEVNULL)
        root = state / "root"
        for package in sorted(state.glob("*.deb")):
            unpack(package, root)
        # In one step: a sysroot that is there is complete.
        shutil.move(root, SYSROOT)


def run_tests() -> int:
    """Run the unit tests that can be run under emulation."""
    say("unit tests under emulation; left out:")
    for pattern, reason in LEFT_OUT.items():
        note(f"{pattern:40} {reason}")
    results = run_ctest(BUILD, "unit under emulation", "--timeout", TEST_SECONDS,
                        "-E", "|".join(LEFT_OUT))
    print(results.count if results.count.passed else "FAIL: no test ran")
    return 1 if results.count.failed or not results.count.passed else 0


def main() -> int:
    """Fetch, build and test."""
    argparse.ArgumentParser(prog="./dev cross", description=__doc__).parse_args()
    make_sysroot()
    build("armhf")
    return run_tests()
