"""What the daemon links and its tests use on 32-bit Arm, fetched from Debian."""

import os
import shutil
import subprocess
import tempfile
from pathlib import Path

from tools.project import PROJECT, say

SYSROOT = PROJECT / "build" / "armhf-sysroot"

# What the cross compiler's own packages do not bring: the target's zlib and GoogleTest.
PACKAGES = ("zlib1g", "zlib1g-dev", "libgtest-dev", "libgmock-dev")

MIRROR = "http://deb.debian.org/debian/"
KEYRING = "/usr/share/keyrings/debian-archive-keyring.gpg"


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
