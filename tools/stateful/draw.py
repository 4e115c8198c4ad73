"""What is done next, by a seeded choice that knows the model: mostly sense, some nonsense."""

from __future__ import annotations

import random
from typing import Callable, Sequence

from amt_station import wire
from tools.stateful import phone as models
from tools.stateful import steps
from tools.stateful.app_model import TUNNELLED
from tools.stateful.draw_mux import draw_mux
from tools.stateful.pc_model import PcModel
from tools.stateful.app_model import AppModel
from tools.stateful.steps import AtomPlan, Step

# A request that stays held beyond this is ended with the daemon, before its buffer is full.
MOST_HELD = 2000
LETTERS = "0123456789ABCDEFabcdefxyz:-."
NUMBERS = (-1, 0, 1, 2, 3, 4, 5, 7, 19, 20, 35, 36, 127, 255, 256, 65535, 2147483647, -2147483648)
FUNCTIONS = ("ldt_btCheck", "ldt_wifiCtrl", "ldt_wifiCheck", "ldt_TxTest", "ldt_RxTest",
             "ldt_gpsCtrl", "ldt_gpsCheck", "enter_idle", "amt_check_system_sanity")
STATUSES = ("0", "0", "0", "0", "-1", "3", "-104")
EVENTS = ("USB_STATE=CONNECTED", "USB_STATE=CONFIGURED", "OLD_USB_STATE=CONFIGURED now",
          "USB_STATE=", "STATE=DISCONNECTED", "ACTION=change", "DEVTYPE=usb", "add@/devices/x")
MODEM_TEXTS = ("\r\nOK\r\n", "\r\nERROR\r\n", "\r\n+CME ERROR: 50\r\n", "\r\nRING\r\n",
               "\r\n^DNOTE: 1\r\n\r\nOK\r\n", "\r\nO", "K\r\n", "AT", "\xff\0\x80")
STRANGE_TEXTS = ("AT^DSVER?\r", "AT^DSVER", "at^dsver\r", "AT+CGMM\r", "ATI\r", "\r\nOK\r\n",
                 "AT^DBTADDR?", "AT^DBTADDR=12\r", "AT^DAMTOFF", "AT ^DSVER\r", "A", "\0", "\xff",
                 "AT\r\n\r\n\r\n", "\xaa\xbb\xcc\xdd", "AT+CSQ;+CREG?\r")
PROBES = ("AT\r", "at\r\n", "At\rAT\r", "AT\r\nAT\r\n", "AT\r\r\r")


class Draw:
    """Draws steps for a run from a seed."""

    def __init__(self, seed: int) -> None:
        self._random = random.Random(seed)

    def step(self, pc: PcModel, app: AppModel, is_held: bool) -> Step:
        """The next step."""
        pick = self._random.random()
        if app.exchange is not None and pick < 0.3:
            return draw_mux(self._random, app.exchange)
        if len(pc.held) > MOST_HELD:
            return Step(steps.PC_RELEASE if is_held else steps.UNPLUG)
        if pc.held and pick > 0.9:
            return Step(steps.UNPLUG)
        kinds: Sequence[tuple[float, Callable[[], Step]]] = (
            (26, self._pc_packet), (22, self._pc_text), (6, self._identity), (5, self._strange),
            (8, self._modem), (3, self._event), (0.15, lambda: Step(steps.UNPLUG)),
            (1, lambda: Step(steps.PC_HELD)), (3, lambda: Step(steps.PC_RELEASE)),
            (4, self._place), (4, self._script),
            (16, self._app_packet), (8, self._app_question), (1, self._mux_alone),
            (0.3, lambda: Step(steps.APP_LEAVES)))
        (_, make), = self._random.choices(kinds, [weight for weight, _ in kinds])
        return make()

    # material

    def _word(self, most: int = 24) -> str:
        return "".join(self._random.choices(LETTERS, k=self._random.randint(1, most)))

    def _number(self) -> int:
        return self._random.choice((*NUMBERS, self._random.getrandbits(31)))

    def _few(self, *values: int) -> int:
        """Mostly one of the values, now and then any number."""
        return self._random.choice(values) if self._random.random() < 0.9 else self._number()

    def _some(self, *atoms: AtomPlan) -> tuple[AtomPlan, ...]:
        """The atoms, seldom without one."""
        kept = list(atoms)
        if kept and self._random.random() < 0.06:
            del kept[self._random.randrange(len(kept))]
        return tuple(kept)

    def _bytes(self, count: int) -> str:
        return self._random.randbytes(count).decode("latin-1")

    # the PC's line

    def _shared(self) -> tuple[int, tuple[AtomPlan, ...]]:
        step = self._few(1, 2, 3, 4, 5, 6) % 256
        plans: Sequence[tuple[int, tuple[AtomPlan, ...]]] = (
            (170, ()), (172, (("int", 110, 1),)), (172, (("int", 110, 3),)),
            (172, (("int", 110, 2), ("string", 111, self._word()))),
            (174, (("int", 140, self._few(0, 1, 2)),)), (176, ()),
            (178, (("int", 141, self._number()),)),
            (185, (("int", 152, self._few(0, 0, 2)),)),
            (185, (("int", 152, 1), ("string", 153, self._word()))),
            (187, (("raw", 154, chr(step)), ("raw", 155, self._bytes(1)),
                   ("raw", 156, self._bytes(2)), ("raw", 157, self._bytes(2)))),
            (187, (("raw", 154, "\1"),)), (240, ()))
        return self._random.choice(plans)

    def _pc_packet(self) -> Step:
        word = self._word()
        own: Sequence[tuple[int, tuple[AtomPlan, ...]]] = (
            (45, (("int", 19, self._few(1, 16, 17, 18, 19, 20, 32, 64)),)),
            (91, (("int", 39, self._few(0, 1, 5, 19, 20)), ("int", 36, self._few(0, 1, 2)))),
            (191, (("int", 160, 0),)), (246, ()), (244, ()), (224, ()), (219, ()),
            (191, (("int", 160, 1), ("int", 162, self._few(1, len(word), 99)),
                   ("string", 161, word))),
            (193, (("flag", 190, 1),)), (193, (("flag", 190, 2), ("string", 191, word))),
            (226, tuple(("int", atom, self._number()) for atom in (146, 147, 148, 149))),
            (5, (("string", 21, word),)), (87, (("string", 38, word),)),
            (232, (("int", 159, self._few(0, 1, 1, 2)),)), (0, (("string", 1, word),)),
            (self._random.randrange(48, 86), (("int", 1, self._number()),)),
            (9, (("string", 3, self._random.choice(("AT^DSVER\r", "AT^DAMT1=2", "AT\r"))),)))
        command, atoms = self._shared() if self._random.random() < 0.5 else (
            self._random.choice(own))
        return Step(steps.PC_PACKET, command=command, atoms=self._some(*atoms))

    def _pc_text(self) -> Step:
        word, any_number = self._word(), self._number
        few = self._few
        text = self._random.choice((
            *PROBES, "AT^DBTADDR?\r", "AT^DBTADDR=?\r", f'AT^DBTADDR="{word}"\r',
            "AT^DWIFIADDR?\r", "AT^DWIFIADDR=?\r", f'AT^DWIFIADDR="{word}"\r', "AT^DSVER\r",
            'AT^DWIFIADDR=""\r', f"AT^DDEVCONNCHK={few(0, 1, 2, 3)}\r",
            f"AT^DBTCTRL={few(0, 1)}\r", f"AT^DGPSCTRL={few(0, 1, 2)},{any_number()}\r",
            "AT^DGPSCTRL=2\r", f"AT^DWLTSD={few(0, 1)},{few(1, 11)},{few(10, 540)},{few(1, 15)}\r",
            f"AT^DWLTRD={few(0, 1)},{few(1, 13)},{any_number()}\r", "AT^DWLTRD=0\r",
            "AT^DPCBACTRL=1\r", f"AT^DPCBACTRL=2,{word}\r", f"AT^DPCBACTRL={any_number()}\r",
            f"AT^DAMT1={few(0, 1, 2, 3)}\r", "AT^DENTERIDLE\r", "AT^DBOOTDLFIN\r",
            "AT^DEMMCINFO?\r", "AT^DAMT1=2\rAT^DWLTSD=0\r"))
        if self._random.random() < 0.02:
            # Without its operands it is refused, and stays held.
            text = self._random.choice(("AT^DGPSCTRL=\r", "AT^DWLTSD=\r", "AT^DAMT1=\r",
                                        'AT^DBTADDR="\r', "AT^DPCBACTRL=2\r"))
        return Step(steps.PC_TEXT, text)

    def _identity(self) -> Step:
        prefix = self._random.choice(("AT^DCGSNW=", "AT^DMSN=", "AT^DCGSNW= "))
        if self._random.random() < 0.3:
            return Step(steps.PC_TEXT, f"AT^DMPCHN={self._few(0, 1, 1, 2)}\r")
        return Step(steps.PC_TEXT, f"{prefix}{self._word()}\r")

    def _strange(self) -> Step:
        return Step(steps.PC_TEXT, self._random.choice(STRANGE_TEXTS))

    def _modem(self) -> Step:
        if self._random.random() < 0.3:
            packet = wire.Packet(self._random.choice((6, 88, 10)),
                                 (wire.Atom.integer(1, self._few(0, 0, 3)),))
            return Step(steps.MODEM, wire.encode_envelope(packet).decode("latin-1"))
        return Step(steps.MODEM, self._random.choice(MODEM_TEXTS))

    def _event(self) -> Step:
        strings = self._random.choices(EVENTS, k=self._random.randint(1, 4))
        return Step(steps.EVENT, lines=tuple(strings))

    # files and functions

    def _place(self) -> Step:
        path, contents = self._random.choice((
            (models.PCBA_FILE, ("PCBA-0042", "", None)), (models.ADB_FILE, ("KEL1\n", " ", None)),
            (models.BT_FILES[0], ("00:11:22:33:44:55\n", None)),
            (models.BT_FILES[1], ("66:77:88:99:aa:bb\n", None)),
            (models.WIFI_FILE, ("00:11:22:33:44:66\n", "0", None)),
            (models.EMMC_FILE, ("HW16G-0099 rev 7\n", "", None)),
            (models.PERMISSION_FILE, ("0", "7\n", "text\n", None)),
            (models.AMT_RESULTS, (None,)), (models.PRODUCT_RESULTS, (None,)),
            (models.VOLTAGE_FILE, ("4011\n", "0\n")), (models.TEMPERATURE_FILE, ("27\n",)),
            (models.LCD_FILE, ("77\n", "0\n"))))
        content = self._random.choice(contents)
        return Step(steps.PLACE, path, None if content is None else (content,),
                    command=self._side(path))

    def _side(self, path: str) -> int:
        if path in (models.VOLTAGE_FILE, models.TEMPERATURE_FILE, models.LCD_FILE,
                    models.PRODUCT_RESULTS):
            return 1
        return self._random.randrange(2)

    def _script(self) -> Step:
        function = self._random.choice(FUNCTIONS)
        statuses = self._random.choices(STATUSES, k=self._random.randint(1, 3))
        if function in ("ldt_RxTest", "ldt_gpsCtrl"):
            more = " 17 -23" if function == "ldt_gpsCtrl" else " 4711"
            statuses = [status + more for status in statuses]
        return Step(steps.SCRIPT, function, tuple(statuses), command=self._random.randrange(2))

    # the app's line

    def _app_packet(self) -> Step:
        own: Sequence[tuple[int, tuple[AtomPlan, ...]]] = (
            (9, ()), (55, ()), (35, (("flag", 15, self._few(0, 1, 2) % 256),)),
            (37, (("flag", 15, self._few(0, 1) % 256),)), (57, (("int", 26, self._number()),)),
            (139, ()), (147, ()), (219, (("int", 192, self._few(0, 1, 2, 3)),)),
            (228, (("int", 39, self._few(0, 1, 5, 35, 36)),)),
            (230, (("int", 39, self._few(1, 2, 5, 36, 37)), ("int", 36, self._few(0, 1, 2, 3)))),
            (45, (("int", 19, self._few(1, 16, 19, 20, 32, 64, 5)),)), (200, ()), (255, ()))
        command, atoms = self._shared() if self._random.random() < 0.5 else (
            self._random.choice(own))
        return Step(steps.APP_PACKET, command=command, atoms=self._some(*atoms))

    def _app_question(self) -> Step:
        plans: Sequence[tuple[int, tuple[AtomPlan, ...]]] = (
            *((command, ()) for command in (65, 85, 99, 197, 234)),
            (45, (("int", 19, self._random.choice((17, 18))),)),
            (89, (("int", 39, self._few(0, 3, 20)),)),
            (91, (("int", 39, self._few(0, 3, 20)), ("int", 36, self._few(1, 2)),
                  ("string", 37, self._word()))),
            (232, (("int", 159, self._few(0, 1, 10)),)),
            *((self._random.choice(TUNNELLED),
               (("int", 5, self._number()), ("flag", 6, self._random.randrange(256)),
                ("raw", 7, self._bytes(self._random.randrange(9))))) for _ in range(6)))
        command, atoms = self._random.choice(plans)
        return Step(steps.APP_PACKET, command=command, atoms=self._some(*atoms))

    def _mux_alone(self) -> Step:
        return Step(steps.MUX, self._random.choice(("\r\nRING\r\n", "\r\n^DLKS: 1\r\n", "\r\n")))
