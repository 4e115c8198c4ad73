"""Which files there are, and which of them a check is for."""

import os
import re
import subprocess
from pathlib import Path
from typing import Iterable, Sequence

from tools import project
from tools.project import PROJECT, die

CPP_ROOMS = ("platform", "pub", "amt", "tests")


def git(*words: str) -> str:
    """What git says; without it there is nothing to look at."""
    try:
        return project.git(*words)
    except project.GitFailed as failed:
        die(f"git cannot tell which files there are: {failed}")


def project_files(paths: Sequence[str] = ()) -> list[str]:
    """The files of the project, those not yet added included, below PATHS."""
    listed = git("ls-files", "-z", "--cached", "--others", "--exclude-standard", "--", *paths)
    return sorted({name for name in listed.split("\0") if name and (PROJECT / name).is_file()
                   and not (PROJECT / name).is_symlink()})


def has_commit(revision: str) -> bool:
    """Whether the clone has a commit; a shallow one lacks the parents."""
    return subprocess.run(["git", "rev-parse", "--quiet", "--verify", f"{revision}^{{commit}}"],
                          cwd=PROJECT, check=False, capture_output=True).returncode == 0


def changed_since(revision: str) -> list[str]:
    """The files that differ from those of a commit, those not yet added included."""
    listed = git("diff", "--name-only", "-z", revision, "--")
    listed += git("ls-files", "-z", "--others", "--exclude-standard")
    return project_files(sorted({f":(top,literal){name}" for name in listed.split("\0") if name})
                         or [":(exclude)*"])


def relative(path: str) -> str:
    """A path of the caller's as git takes it from the root."""
    return os.path.relpath(os.path.realpath(path), PROJECT)


def of_kind(files: Iterable[str], *suffixes: str) -> list[str]:
    """The files with one of the SUFFIXES."""
    return [name for name in files if name.endswith(suffixes)]


def cpp_files(files: Iterable[str], *suffixes: str) -> list[str]:
    """The C++ files in the rooms that hold C++."""
    return [name for name in of_kind(files, *suffixes) if name.split("/")[0] in CPP_ROOMS]


def shell_files(files: Iterable[str]) -> list[str]:
    """The files that a shell runs, known by their first line when not by their name."""
    return [name for name in files if name.endswith(".sh")
            or ("." not in Path(name).name and is_shell(PROJECT / name))]


def is_shell(path: Path) -> bool:
    """Whether a file's first line calls a shell."""
    with open(path, "rb") as stream:
        return re.match(rb"#!.*\b(ba)?sh\b", stream.readline()) is not None
