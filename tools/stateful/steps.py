"""The steps of a run: plain data, drawn from a seed, written to and read from a file of lines."""

from __future__ import annotations

import json
from dataclasses import dataclass
from pathlib import Path
from typing import Iterable, Sequence

from amt_station import wire

# What a step does.
PC_PACKET, PC_TEXT, PC_HELD, PC_RELEASE = "pc-packet", "pc-text", "pc-held", "pc-release"
MODEM, EVENT, UNPLUG = "modem", "event", "unplug"
APP_PACKET, APP_LEAVES, MUX = "app-packet", "app-leaves", "mux"
PLACE, SCRIPT = "place", "script"

AtomPlan = tuple[str, int, "int | str"]


@dataclass(frozen=True)
class Step:
    """One thing that is done to the handsets. Bytes are kept as text of one byte a character."""

    do: str
    # A text to say, the name of a file or of a function.
    text: str = ""
    # What a file is to hold (None: it is taken away), what a function is to answer, an event.
    lines: "tuple[str, ...] | None" = None
    command: int = 0
    atoms: tuple[AtomPlan, ...] = ()

    @property
    def packet(self) -> wire.Packet:
        """The packet that is sent."""
        return wire.Packet(self.command, tuple(_atom(*plan) for plan in self.atoms))

    @property
    def data(self) -> bytes:
        """The bytes that are said."""
        return self.text.encode("latin-1")

    def as_line(self) -> str:
        """The step as a line of a file."""
        shown = {name: value for name, value in vars(self).items()
                 if name == "do" or value not in ("", None, 0, ())}
        return json.dumps(shown)

    @classmethod
    def from_line(cls, line: str) -> "Step":
        """Read what `as_line` has made."""
        given = json.loads(line)
        atoms = tuple((str(kind), int(atom), value)
                      for kind, atom, value in given.pop("atoms", ()))
        lines = given.pop("lines", None)
        return cls(**given, atoms=atoms, lines=None if lines is None else tuple(lines))


def _atom(kind: str, number: int, value: "int | str") -> wire.Atom:
    if isinstance(value, int):
        return wire.Atom.boolean(number, value) if kind == "flag" else wire.Atom.integer(number,
                                                                                         value)
    if kind == "raw":
        return wire.Atom.raw(number, value.encode("latin-1"))
    return wire.Atom.string(number, value)


def write_steps(path: Path, seed: int, steps: Sequence[Step]) -> None:
    """A file of steps, its seed in a remark in front."""
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_text("".join([f"# seed {seed}\n", *(f"{step.as_line()}\n" for step in steps)]),
                    encoding="utf-8")


def read_steps(lines: Iterable[str]) -> list[Step]:
    """The steps of a file; remarks and empty lines are none."""
    return [Step.from_line(line) for line in lines if line.strip() and not line.startswith("#")]
