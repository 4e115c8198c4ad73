"""Where the project lies, and how the tools speak to whoever called ./dev."""

import os
import sys
from pathlib import Path
from typing import NoReturn

PROJECT = Path(__file__).resolve().parents[1]
CORES = len(os.sched_getaffinity(0))


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
