"""The colours of verdicts and states on a terminal."""

from typing import Mapping

STYLES: Mapping[str, str] = {
    "pass": "bold green", "fail": "bold red", "error": "bold yellow", "skipped": "dim",
    "running": "bold cyan", "asking": "bold magenta", "waiting": "dim", "ended": "dim",
    "held": "bold yellow", "defect": "bold red", "verdict": "",
    "PASS": "bold white on green", "FAIL": "bold white on red",
    "ERROR": "bold black on yellow", "ABORTED": "bold white on magenta"}
