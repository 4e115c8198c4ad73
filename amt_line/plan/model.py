"""What a plan consists of once it has been read; values may still hold references."""

from __future__ import annotations

from dataclasses import dataclass, field
from enum import Enum
from pathlib import Path
from typing import Any, Mapping

from amt_line.plan.inputs import Input
from amt_line.plan.limits import Limit
from amt_station.requests.model import Channel


class Section(str, Enum):
    """The three lists of steps."""

    SETUP = "setup"
    STEP = "step"
    ALWAYS = "always"


class Kind(str, Enum):
    """What a step does; the word is the key that says it in the plan."""

    COMMAND = "command"
    REQUEST = "request"
    AT = "at"
    ASK = "ask"
    ENTER = "enter"
    WAIT = "wait"

    @property
    def needs_handset(self) -> bool:
        """Whether the step sends something."""
        return self in (Kind.COMMAND, Kind.REQUEST, Kind.AT)


class When(str, Enum):
    """On what a step depends."""

    PASSED = "passed"
    FAILED = "failed"
    CONNECTED = "connected"


@dataclass(frozen=True)
class Step:
    """One thing to do. ``subject`` is what the kind's key holds; for a wait it is the seconds."""

    section: Section
    number: int
    name: str
    kind: Kind
    subject: str
    channel: Channel
    values: Mapping[str, Any] = field(default_factory=dict)
    atoms: tuple[str, ...] = ()
    expect: str = "OK"
    wanted: bool = True
    picture: Path | None = None
    seconds: float = 0.0
    limits: tuple[Limit, ...] = ()
    save: Mapping[str, str] = field(default_factory=dict)
    timeout: float | None = None
    stop: bool = False
    when: When | None = None
    retries: int = 0
    retry_delay: float = 0.0
    force: bool = False
    reconnect: float | None = None
    needs: tuple[str, ...] = ()

    @property
    def place(self) -> str:
        """Where the step stands, for messages."""
        return place(self.section.value, self.number, self.name)


def place(section: str, number: int, name: str = "") -> str:
    """Where a step stands: its list, its number in it, and its name."""
    return f"{section} {number}" + (f" {name!r}" if name else "")


@dataclass(frozen=True)
class Plan:
    """A whole plan, and the file that it came from."""

    title: str
    version: str
    path: str
    sha256: str
    channel: Channel
    deadline: float | None
    dut: str
    inputs: tuple[Input, ...]
    setup: tuple[Step, ...]
    steps: tuple[Step, ...]
    always: tuple[Step, ...]

    @property
    def every_step(self) -> tuple[Step, ...]:
        """All steps in the order in which they are carried out."""
        return (*self.setup, *self.steps, *self.always)
