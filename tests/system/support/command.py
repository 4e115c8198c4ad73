"""The `amt-handset` command as tests run it."""

import subprocess
import sys
from pathlib import Path

PROJECT = Path(__file__).resolve().parents[3]
COMMAND = [sys.executable, "-m", "amt_simulator"]
# The seconds that a stuck machine does not need.
PATIENCE = 300


def handset(*words: str, timeout: float = PATIENCE) -> "subprocess.CompletedProcess[str]":
    """Run the command to its end."""
    return subprocess.run([*COMMAND, *words], cwd=PROJECT, text=True, timeout=timeout,
                          capture_output=True, check=False)


def output(*words: str) -> str:
    """What the command prints; it must succeed."""
    done = handset(*words)
    assert done.returncode == 0, done.stderr
    return done.stdout
