"""Where the project lies, and how the tools speak to whoever called ./dev."""

import os
import subprocess
import sys
from pathlib import Path
from typing import NoReturn

PROJECT = Path(__file__).resolve().parents[1]
CORES = len(os.sched_getaffinity(0))


class GitFailed(Exception):
    """What git has said instead of an answer."""


def git(*words: str) -> str:
    """What git says of the project."""
    try:
        ended = subprocess.run(["git", *words], cwd=PROJECT, check=False, capture_output=True,
                               text=True)
    except OSError as error:
        raise GitFailed(f"git: {error.strerror}") from None
    if ended.returncode != 0:
        raise GitFailed(ended.stderr.strip())
    return ended.stdout


def say(text: str) -> None:
    """Say what is going on; standard output stays for results."""
    print(f"\n== {text}", file=sys.stderr, flush=True)


def note(text: str) -> None:
    """Something about what goes on."""
    print(f"   {text}", file=sys.stderr, flush=True)


def die(text: str) -> NoReturn:
    """End with one line."""
    print(f"dev: {text}", file=sys.stderr)
    sys.exit(1)
