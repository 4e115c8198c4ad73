"""Two real handsets, one on each path, and the model of both: a step is done to all of them."""

from __future__ import annotations

from dataclasses import dataclass, field
from types import TracebackType
from typing import Callable, Mapping

from amt_simulator import Handset
from amt_simulator.errors import HandsetError
from amt_simulator.line import Line
from amt_station import wire
from tools.stateful import phone as models
from tools.stateful import steps
from tools.stateful.app_model import AppModel
from tools.stateful.held_call import HeldCall
from tools.stateful.pc_model import Expected, PcModel
from tools.stateful.side import Mismatch, Side, same
from tools.stateful.steps import Step

LOOP = "amt_handle_monitor_usb_loop"
HELD_FUNCTION, HELD_TEXT = "ldt_btCtrl", b"AT^DBTCTRL=1\r"

# What is there at first, and in the kernel's own words.
FIRST_FILES: Mapping[str, str] = {
    models.WIFI_DEBUG: "", models.EMMC_FILE: "HW8G-0031 7456 MiB rev 5\n",
    models.LCD_FILE: "128\n", models.BUTTON_FILE: "0\n", models.VIBRATOR_FILE: "0\n",
    models.VOLTAGE_FILE: "3987000\n", models.TEMPERATURE_FILE: "315\n",
}


@dataclass
class World:
    """Both handsets up. `patience`: the seconds that an answer may take; None: the usual."""

    build: str
    patience: float | None = None
    pc_model: PcModel = field(default_factory=PcModel)
    app_model: AppModel = field(default_factory=AppModel)
    held: HeldCall | None = None
    queued: bytes = b""
    # What the handsets had to tell when a step went wrong.
    last_story: str = ""

    def __enter__(self) -> "World":
        self._handsets = [Handset(path, self.build, files=FIRST_FILES)
                          for path in ("pc", "packet")]
        try:
            for handset in self._handsets:
                handset.up()
            for handset in self._handsets:
                handset.wait_ready()
            self._take_lines()
        except BaseException:
            self._down()
            raise
        return self

    def _take_lines(self) -> None:
        pc, packet = self._handsets
        self.pc, self.app = (
            Side("pc", pc, self.pc_model.phone, (pc.pc.open(), pc.modem.open())),
            Side("packet", packet, self.app_model.phone, (packet.app.open(), packet.mux.open())))
        for side in self.sides:
            side.phone.files.update(FIRST_FILES)
            side.new_calls()

    def __exit__(self, kind: type[BaseException] | None, error: BaseException | None,
                 trace: TracebackType | None) -> None:
        try:
            if kind is None:
                self.end()
            else:
                self.last_story = self._story()
        except BaseException:
            self.last_story = self._story()
            raise
        finally:
            self._down()

    @property
    def sides(self) -> tuple[Side, Side]:
        """Both."""
        return self.pc, self.app

    def _down(self) -> None:
        for handset in self._handsets:
            handset.down()

    def end(self) -> None:
        """End both daemons: with the status 0, and without a word of a sanitizer."""
        if self.held is not None:
            self.apply(Step(steps.PC_RELEASE))
        for side in self.sides:
            side.check()
            side.check_size()
            same(f"{side.name}: status at the end", side.handset.stop(), 0)
            same(f"{side.name}: sanitizer reports", side.handset.sanitizer_reports(), {})

    def _story(self) -> str:
        return "\n".join(text for handset in self._handsets for text in
                         (handset.story(), *handset.sanitizer_reports().values()))

    def check_size(self) -> None:
        """Neither daemon has grown."""
        if self.held is None:
            for side in self.sides:
                side.check_size()
                side.cut_records()

    # steps

    def can(self, step: Step) -> bool:
        """Whether a step makes sense now; in a shortened run it may not."""
        is_held, is_asked = self.held is not None, self.app_model.exchange is not None
        if step.do in (steps.PC_PACKET, steps.PC_TEXT):
            return not (is_held and self.queued)
        if step.do == steps.PC_HELD:
            return not is_held and not self.pc_model.held
        if step.do == steps.PC_RELEASE:
            return is_held
        if step.do == steps.SCRIPT:
            return not (is_held and step.text == HELD_FUNCTION)
        if step.do == steps.UNPLUG:
            return not is_held
        if step.do in (steps.APP_PACKET, steps.APP_LEAVES):
            return not is_asked
        return True

    def apply(self, step: Step) -> None:
        """Do a step to the handsets and to the model; raise when they differ."""
        actions: Mapping[str, Callable[[Step], None]] = {
            steps.PC_PACKET: lambda step: self._say_pc(wire.encode_envelope(step.packet)),
            steps.PC_TEXT: lambda step: self._say_pc(step.data),
            steps.PC_HELD: self._hold, steps.PC_RELEASE: self._release,
            steps.MODEM: self._say_modem, steps.EVENT: self._event, steps.UNPLUG: self._unplug,
            steps.APP_PACKET: self._ask, steps.APP_LEAVES: self._leave, steps.MUX: self._say_mux,
            steps.PLACE: self._place, steps.SCRIPT: self._script,
        }
        try:
            actions[step.do](step)
            for side in self.sides:
                side.check()
        except (HandsetError, OSError) as error:
            raise Mismatch(f"{type(error).__name__}: {error}") from error

    def _expect(self, line: Line, wanted: bytes) -> None:
        if wanted:
            same(f"the line {line.name}", line.read_exactly(len(wanted), self.patience), wanted)

    def _expect_pc(self, expected: Expected) -> None:
        self._expect(self.pc.handset.pc, expected.pc)
        self._expect(self.pc.handset.modem, expected.modem)

    def _say_pc(self, data: bytes) -> None:
        self.pc.handset.pc.write(data)
        if self.held is not None:
            self.queued = data
        else:
            self._expect_pc(self.pc_model.hear_pc(data))

    def _hold(self, _: Step) -> None:
        self.held = HeldCall(self.pc.handset, HELD_FUNCTION)
        self.pc.handset.pc.write(HELD_TEXT)
        self.held.wait()

    def _release(self, _: Step) -> None:
        assert self.held is not None
        held, self.held = self.held, None
        self.pc_model.phone.scripts[HELD_FUNCTION] = ["0"]
        held.release()
        self._expect_pc(self.pc_model.hear_pc(HELD_TEXT))
        queued, self.queued = self.queued, b""
        if queued:
            self._expect_pc(self.pc_model.hear_pc(queued))

    def _say_modem(self, step: Step) -> None:
        self.pc.handset.modem.write(step.data)
        self._expect_pc(self.pc_model.hear_modem(step.data))

    def _ask(self, step: Step) -> None:
        handset = self.app.handset
        unread, mark = len(self.app_model.unread), handset.log.mark()
        told, asked = self.app_model.hear_app(step.packet)
        handset.app.write(step.packet.encode())
        self._expect(handset.mux, asked)
        self._expect(handset.app, told)
        if unread and asked and not told:
            handset.log.wait(f"read_at read_len_ptr[{unread}]", mark, self.patience)

    def _say_mux(self, step: Step) -> None:
        handset = self.app.handset
        is_asked, mark = self.app_model.exchange is not None, handset.log.mark()
        told = self.app_model.hear_mux(step.text)
        handset.mux.write(step.data)
        self._expect(handset.app, told)
        if is_asked and not told:
            handset.log.wait(f"read_at read_len_ptr[{len(step.data)}]", mark, self.patience)

    def _leave(self, _: Step) -> None:
        self.app.handset.app.close()
        self.app.handset.app.open(self.patience)

    def _event(self, step: Step) -> None:
        handset = self.pc.handset
        strings, mark = step.lines or (), handset.log.mark()
        handset.usb.send(*strings)
        state = next((index for index, text in enumerate(strings) if "USB_STATE" in text), None)
        logged = [f"uevent:[{text}]" for text in strings[:None if state is None else state + 1]]
        if state is None:
            handset.log.wait(f"{LOOP} uevent:[SEQNUM=", mark, self.patience)
        else:
            is_configured = "CONFIGURED" in strings[state]
            logged += [f"usb_status:[{strings[state]}]",
                       f"get usb {'CONFIGURED' if is_configured else 'other status'} event"]
            handset.log.wait(f"{LOOP} {logged[-1]}", mark, self.patience)
        found = [text.removeprefix(f"{LOOP} ").split(" nLen:")[0]
                 for text in handset.log.texts(after=mark) if text.startswith(f"{LOOP} ")]
        same("pc: what the event has logged",
             [text for text in found if not text.startswith("uevent:[SEQNUM=")], logged)

    def _unplug(self, _: Step) -> None:
        handset = self.pc.handset
        ended = len(handset.exits())
        handset.usb.send("ACTION=change", "USB_STATE=DISCONNECTED")
        same("pc: status after the cable has gone",
             handset.wait_exit(ended, self.patience), 0)
        handset.wait_ready(self.patience)
        self.pc_model.restart()
        self.pc.look = None
        # The start renews the radio's file, and flushes it.
        self.pc.phone.flush()

    def _place(self, step: Step) -> None:
        content = None if step.lines is None else step.lines[0]
        side = self.side_of(step)
        path = side.handset.path(step.text)
        if path.parent.is_dir():
            path.parent.chmod(0o777)
        side.handset.place(step.text, content)
        if content is None:
            side.phone.files.pop(step.text, None)
        else:
            side.phone.files[step.text] = content

    def _script(self, step: Step) -> None:
        assert step.lines is not None
        side = self.side_of(step)
        side.handset.answer(step.text, *step.lines)
        side.phone.scripts[step.text] = list(step.lines)

    def side_of(self, step: Step) -> Side:
        """Whose file or function a step is about."""
        return self.sides[step.command]
