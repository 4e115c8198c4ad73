"""The C++ sources: their layout, and static analysis."""

import hashlib
import json
import os
import re
from concurrent.futures import ThreadPoolExecutor
from functools import lru_cache
from pathlib import Path
from typing import Mapping, Sequence

from tools.lint.files import cpp_files, of_kind, project_files
from tools.lint.includes import all_included
from tools.lint.verdict import Verdict, plain, run
from tools.project import CORES, PROJECT

# A configuration of its own, which nothing is built in: GCC's precompiled headers, which the other
# builds use, mean nothing to clang-tidy.
PRESET = "lint"
BUILD = PROJECT / "build" / PRESET

# A file that clang-tidy has found clean leaves a mark here and is not looked at again until it,
# something that it includes, its compile command or the configuration has changed.
MARKS = BUILD / "marks"

# The compile commands are GCC's; what clang-tidy does not know of them says nothing about the code.
TIDY_FLAGS = ("--extra-arg=-std=gnu++17", "--extra-arg=-Wno-unknown-warning-option")
TIDY_NOISE = re.compile(r"^\d+ warnings?( and \d+ errors?)? generated\.$|^Suppressed ")


def check_format(files: list[str]) -> Verdict:
    """Is every C++ file as clang-format lays it out?"""
    return plain(of_kind(files, ".cpp", ".h"), ["clang-format", "--dry-run", "-Werror"])


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


def sources_to_look_at(files: Sequence[str]) -> tuple[list[str], list[str]]:
    """The sources among FILES, a source for each header among them, and headers without any.

    Analysis sees a header through a source that includes it: its own where there is one.
    """
    chosen = set(cpp_files(files, ".cpp"))
    waiting = set(cpp_files(files, ".h"))
    sources = cpp_files(project_files(), ".cpp")
    own = {f"{name.removesuffix('.h')}.cpp" for name in waiting}
    for name in [*sorted(chosen), *sorted(own.intersection(sources)), *sources]:
        found = waiting.intersection(all_included(name))
        if found:
            chosen.add(name)
            waiting -= found
    return sorted(chosen), sorted(waiting)


def check_tidy(files: list[str]) -> Verdict:
    """Does static analysis find a mistake in a C++ source, or in a header that it includes?"""
    sources, unused = sources_to_look_at(files)
    findings = [f"{name}: error: nothing includes this header" for name in unused]
    if not sources:
        return Verdict(0, findings)
    status, output = run(["cmake", "--preset", PRESET])
    if status != 0:
        return Verdict(0, [*findings, output])
    MARKS.mkdir(parents=True, exist_ok=True)
    commands = compile_commands()
    pool = ThreadPoolExecutor(CORES)
    try:
        said = list(pool.map(lambda name: tidy(name, commands), sources))
    finally:
        # Interrupted, it must not wait for what it has begun.
        pool.shutdown(wait=False, cancel_futures=True)
    return Verdict(len(sources), [*findings, *(text for text in said if text)])
