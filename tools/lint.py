"""Look at every source file without running it: `./dev lint`."""

import argparse
import hashlib
import json
import os
import re
import subprocess
import sys
import time
from concurrent.futures import ThreadPoolExecutor
from dataclasses import dataclass, field
from functools import lru_cache
from pathlib import Path
from typing import Callable, Iterable, Iterator, Mapping, Sequence

PROJECT = Path(__file__).resolve().parents[1]
BUILD = PROJECT / "build" / "release"

# A file that clang-tidy has found clean leaves a mark here and is not looked at again until it,
# something that it includes, its compile command or the configuration has changed.
MARKS = PROJECT / "build" / "lint"

CPP_ROOMS = ("platform", "pub", "amt", "tests")
INCLUDE = re.compile(rb'^\s*#\s*include\s+"([^"]+)"', re.MULTILINE)

# The compile commands are GCC's; what clang-tidy does not know of them says nothing about the code.
TIDY_FLAGS = ("--extra-arg=-std=gnu++17", "--extra-arg=-Wno-unknown-warning-option")
TIDY_NOISE = re.compile(r"^\d+ warnings?( and \d+ errors?)? generated\.$|^Suppressed ")

# Tests say what they take and give where a reader needs it, not everywhere.
RELAXED_TYPES = ("--allow-untyped-defs", "--allow-incomplete-defs", "--allow-untyped-calls",
                 "--allow-untyped-decorators", "--allow-any-generics", "--no-warn-return-any")


@dataclass
class Verdict:
    """What a check said; no findings is a pass."""

    checked: int
    findings: list[str] = field(default_factory=list)


Check = Callable[[list[str]], Verdict]


def run(command: Sequence[str], **environment: str) -> tuple[int, str]:
    """Run a linter from the root; its status and everything it printed."""
    ended = subprocess.run(command, cwd=PROJECT, check=False, stdin=subprocess.DEVNULL,
                           stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                           text=True, errors="backslashreplace",
                           env={**os.environ, **environment})
    return ended.returncode, ended.stdout.strip()


def plain(files: list[str], command: Sequence[str], **environment: str) -> Verdict:
    """A linter that takes all its files at once and fails when it has something to say."""
    if not files:
        return Verdict(0)
    status, output = run([*command, *files], **environment)
    return Verdict(len(files), [output or f"{command[0]} ended with status {status}"]
                   if status else [])


# which files there are

def project_files(paths: Sequence[str]) -> list[str]:
    """The files of the project, those not yet added included, below PATHS."""
    listed = subprocess.run(
        ["git", "ls-files", "-z", "--cached", "--others", "--exclude-standard", "--", *paths],
        cwd=PROJECT, check=False, capture_output=True, text=True)
    if listed.returncode != 0:
        sys.exit(f"dev: git cannot tell which files there are: {listed.stderr.strip()}")
    return sorted({name for name in listed.stdout.split("\0") if name and (PROJECT / name).is_file()
                   and not (PROJECT / name).is_symlink()})


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


# C++

def check_format(files: list[str]) -> Verdict:
    """Is every C++ file as clang-format lays it out?"""
    return plain(of_kind(files, ".cpp", ".h"), ["clang-format", "--dry-run", "-Werror"])


@lru_cache(maxsize=None)
def included_by(name: str) -> frozenset[str]:
    """The files of the project that a file includes itself."""
    found = set()
    for match in INCLUDE.findall((PROJECT / name).read_bytes()):
        beside = Path(os.path.normpath(Path(name).parent / match.decode()))
        for candidate in (Path(match.decode()), PROJECT / "platform/include" / match.decode(),
                          beside):
            if (PROJECT / candidate).is_file():
                found.add(os.path.relpath(PROJECT / candidate, PROJECT))
                break
    return frozenset(found)


def all_included(name: str) -> list[str]:
    """A file and whatever it includes of the project, however far away."""
    seen: set[str] = set()
    waiting = {name}
    while waiting:
        seen |= waiting
        waiting = {other for one in waiting for other in included_by(one)} - seen
    return sorted(seen)


@lru_cache(maxsize=None)
def content_hash(name: str) -> bytes:
    """A file's content in short."""
    return hashlib.sha256((PROJECT / name).read_bytes()).digest()


@lru_cache(maxsize=None)
def tidy_settings() -> bytes:
    """What clang-tidy's opinion depends on besides the code: its version and configuration."""
    _, version = run(["clang-tidy", "--version"])
    settings = [path.read_bytes() for path in sorted(PROJECT.rglob(".clang-tidy"))
                if "build" not in path.parts]
    return repr([version, TIDY_FLAGS, settings]).encode()


def compile_commands() -> dict[str, str]:
    """How each file of the project is compiled."""
    entries = json.loads((BUILD / "compile_commands.json").read_text())
    return {os.path.relpath(entry["file"], PROJECT): entry["command"] for entry in entries}


def tidy_mark(name: str, command: str) -> Path:
    """The mark that stands for a clean look at a file as it is now."""
    key = hashlib.sha256(tidy_settings() + command.encode())
    for included in all_included(name):
        key.update(included.encode() + content_hash(included))
    return MARKS / key.hexdigest()


def tidy(name: str, commands: Mapping[str, str]) -> str:
    """What clang-tidy has to say about a file."""
    if name not in commands:
        return f"{name}: error: no build compiles this file"
    mark = tidy_mark(name, commands[name])
    if mark.exists():
        return ""
    status, output = run(["clang-tidy", "-p", str(BUILD), "--quiet", *TIDY_FLAGS, name])
    if status == 0:
        mark.write_text(name + "\n")
        return ""
    said = [line for line in output.splitlines() if not TIDY_NOISE.match(line)]
    return "\n".join(said) or f"{name}: clang-tidy ended with status {status}"


def check_tidy(files: list[str]) -> Verdict:
    """Does static analysis find a mistake in a C++ source, or in a header that it includes?"""
    sources = cpp_files(files, ".cpp")
    MARKS.mkdir(parents=True, exist_ok=True)
    commands = compile_commands() if sources else {}
    with ThreadPoolExecutor(os.cpu_count()) as pool:
        said = pool.map(lambda name: tidy(name, commands), sources)
        return Verdict(len(sources), [text for text in said if text])


# scripts and Python

def check_shell(files: list[str]) -> Verdict:
    """Do the shell scripts do what they look like?"""
    return plain(shell_files(files), ["shellcheck", "-x"])


def check_style(files: list[str]) -> Verdict:
    """Is the Python laid out as agreed, and free of names that nobody uses?"""
    return plain(of_kind(files, ".py"), [sys.executable, "-m", "flake8"])


def type_runs(files: list[str]) -> Iterator[tuple[list[str], list[str], dict[str, str]]]:
    """Files, options and environment of each run of mypy: a folder of tests is its own root."""
    folders: dict[str, list[str]] = {}
    for name in of_kind(files, ".py"):
        parts = name.split("/")
        folders.setdefault("/".join(parts[:2]) if parts[0] == "tests" else "", []).append(name)
    for folder, names in folders.items():
        if folder:
            roots = f"{PROJECT}:{PROJECT / folder}"
            yield names, ["--explicit-package-bases", *RELAXED_TYPES], {"MYPYPATH": roots}
        else:
            yield names, ["--explicit-package-bases"], {"MYPYPATH": str(PROJECT)}


def check_types(files: list[str]) -> Verdict:
    """Do the Python types fit? Strictly, but for the tests."""
    verdict = Verdict(0)
    for names, options, environment in type_runs(files):
        one = plain(names, [sys.executable, "-m", "mypy", "--no-error-summary", *options],
                    **environment)
        verdict.checked += one.checked
        verdict.findings += one.findings
    return verdict


CHECKS: dict[str, Check] = {
    "clang-format": check_format,
    "shellcheck": check_shell,
    "flake8": check_style,
    "mypy": check_types,
    "clang-tidy": check_tidy,
}


def main() -> int:
    """Run every check and give one verdict."""
    parser = argparse.ArgumentParser(prog="./dev lint", description=__doc__)
    parser.add_argument("path", nargs="*", help="only files below these")
    files = project_files([os.path.abspath(path) for path in parser.parse_args().path])
    if not files:
        sys.exit("dev: no file of the project there")
    failed = []
    for name, check in CHECKS.items():
        print(f"== {name}", file=sys.stderr, end="", flush=True)
        started = time.monotonic()
        verdict = check(files)
        print(f": {verdict.checked} files in {time.monotonic() - started:.0f} s", file=sys.stderr)
        if verdict.findings:
            failed.append(name)
            print("\n".join(verdict.findings), flush=True)
    if failed:
        print(f"FAIL: {', '.join(failed)}")
        return 1
    print(f"PASS: {len(files)} files, {len(CHECKS)} checks")
    return 0


if __name__ == "__main__":
    sys.exit(main())
