"""Holds a dialogue with a daemon that may fail: says its part, and takes down the rest."""

import time
from dataclasses import dataclass, field

from amt_simulator.waiting import scaled
from amt_station import wire
from amt_station.trace.dialogue import Dialogue, Step
from tools.torture.stage import (END_SECONDS, MODEM_OBEYS, SILENCE, STEP_SECONDS, Stage,
                                 nobody_listens)

# What has been said already is heard so soon, once the daemon has come to rest.
GRACE_SECONDS = 0.5


# What is not as the dialogue has it when it is no file: what was heard.
STATION = "the station"


@dataclass(frozen=True)
class Wrong:
    """A file or a property that is not as the dialogue has it."""

    name: str
    there: "bytes | str | None"
    wanted: object

    def __str__(self) -> str:
        return f"{self.name} is {self.there!r} instead of {self.wanted!r}"


@dataclass
class Heard:
    """What a dialogue has brought to light."""

    # For each thing that the station said, what it heard; the last belongs to its good request.
    answers: list[bytes] = field(default_factory=lambda: [b""])
    # Files and properties that are not as the dialogue has them.
    wrong: list[Wrong] = field(default_factory=list)


class Play:
    """A dialogue on a stage."""

    def __init__(self, stage: Stage, dialogue: Dialogue) -> None:
        self.stage = stage
        self.dialogue = dialogue
        self.heard = Heard()
        self._modem_said = b""
        self._is_asked = True
        self._wanted = b""

    def hold(self) -> Heard:
        """Do every step that the daemon lives to see."""
        self.stage.listen = self.take_all
        for step in self.dialogue.steps:
            act = getattr(self, "_do_" + step.action.replace(" ", "_"), None)
            if act is not None:
                act(step)
        self.stage.release()
        self.take_all()
        self.stage.listen = nobody_listens
        return self.heard

    # hearing

    def take_all(self) -> None:
        """Hear what there is."""
        self.heard.answers[-1] += self.stage.take(self.stage.station)
        self._modem_said += self.stage.take(self.stage.modem)

    def _wait_for(self, wanted: bytes, of_modem: bool) -> bytes:
        """What is heard, as soon as it is WANTED or can no more become it."""
        def said() -> bytes:
            self.take_all()
            return self._modem_said if of_modem else self.heard.answers[-1]

        def is_open() -> bool:
            return len(said()) < len(wanted) and wanted.startswith(said())

        if is_open():
            self.stage.settle()
        late = time.monotonic() + scaled(GRACE_SECONDS)
        while is_open() and time.monotonic() < late and not self.stage.given_up:
            time.sleep(STEP_SECONDS)
        return said()

    def _encode(self, message: object) -> bytes:
        assert isinstance(message, (bytes, wire.Packet))
        if isinstance(message, bytes):
            return message
        return message.encode() if self.stage.is_app else wire.encode_envelope(message)

    # the station

    def _do_station_says(self, step: Step) -> None:
        if not self._is_asked:
            self.stage.release()
        self.take_all()
        self.heard.answers.append(b"")
        self._wanted = b""
        self.stage.say(self.stage.station, self._encode(step.argument))

    def _do_station_hears(self, step: Step) -> None:
        self._wanted += self._encode(step.argument)
        said = self._wait_for(self._wanted, False)
        if not said.startswith(self._wanted):
            self.heard.wrong.append(Wrong(STATION, said, self._wanted))

    # the modem, which says nothing that it was not asked

    def _do_modem_hears(self, step: Step) -> None:
        wanted = self._encode(step.argument)
        said = self._wait_for(wanted, True)
        if said.startswith(SILENCE) and not wanted.startswith(SILENCE):
            # Its line was lost and has been opened again.
            self._modem_said = said[len(SILENCE):]
            self.stage.say(self.stage.modem, MODEM_OBEYS)
            said = self._wait_for(wanted, True)
        self._is_asked = said.startswith(wanted)
        self._modem_said = said[len(wanted):] if self._is_asked else b""

    def _do_modem_says(self, step: Step) -> None:
        if self._is_asked:
            self.stage.say(self.stage.modem, self._encode(step.argument))

    _do_modem_adds = _do_modem_says

    def _do_modem_dies(self, _step: Step) -> None:
        self.stage.modem.hang_up()

    def _do_modem_returns(self, _step: Step) -> None:
        self.stage.modem.come_back(held=True)
        self.stage.modem.open()
        self.stage.settle()

    # ends

    def _do_daemon_ends(self, _step: Step) -> None:
        self.stage.settle(quiet=4.0)
        # Its readers may wait again before the signal that it has sent to itself is met.
        self.stage.wait_end(END_SECONDS)

    def _do_handset_off(self, _step: Step) -> None:
        self.stage.settle(quiet=4.0)

    # surroundings

    def _do_file_becomes(self, step: Step) -> None:
        assert isinstance(step.argument, bytes)
        self.stage.handset.place(step.subject, step.argument)

    def _do_file_vanishes(self, step: Step) -> None:
        self.stage.handset.place(step.subject, None)

    def _do_property_becomes(self, step: Step) -> None:
        assert isinstance(step.argument, str)
        self.stage.handset.set_property(step.subject, step.argument)

    def _do_call_answers(self, step: Step) -> None:
        assert isinstance(step.argument, str)
        self.stage.handset.answer(step.subject, step.argument)

    def _do_file_is(self, step: Step) -> None:
        path = self.stage.handset.path(step.subject)
        self._check(step, path.read_bytes() if path.is_file() else None)

    def _do_file_absent(self, step: Step) -> None:
        self._do_file_is(step)

    def _do_property_is(self, step: Step) -> None:
        self._check(step, self.stage.handset.get_property(step.subject))

    def _do_property_absent(self, step: Step) -> None:
        self._do_property_is(step)

    def _check(self, step: Step, there: "bytes | str | None") -> None:
        if there != step.argument:
            self.heard.wrong.append(Wrong(step.subject, there, step.argument))


def hear(stage: Stage, wanted: bytes, seconds: float = GRACE_SECONDS) -> bytes:
    """What the station hears up to WANTED, which comes soon if it comes at all."""
    said = b""
    late = time.monotonic() + scaled(seconds)
    while not said.endswith(wanted) and time.monotonic() < late:
        said += stage.take(stage.station)
        time.sleep(STEP_SECONDS)
    return said
