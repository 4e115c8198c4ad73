"""What a check says, and how it runs a linter."""

from dataclasses import dataclass, field
from typing import Callable, Sequence

from tools import children


@dataclass
class Verdict:
    """What a check said; no findings is a pass."""

    checked: int
    findings: list[str] = field(default_factory=list)


Check = Callable[[list[str]], Verdict]


def run(command: Sequence[str], **environment: str) -> tuple[int, str]:
    """Run a linter from the root; its status and everything it printed."""
    said: list[bytes] = []
    status = children.run(command, said.append, environment)
    return status, b"".join(said).decode(errors="backslashreplace").strip()


def plain(files: list[str], command: Sequence[str], **environment: str) -> Verdict:
    """A linter that takes all its files at once and fails when it has something to say."""
    if not files:
        return Verdict(0)
    status, output = run([*command, *files], **environment)
    return Verdict(len(files), [output or f"{command[0]} ended with status {status}"]
                   if status else [])
