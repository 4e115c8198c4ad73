"""The AT texts that the PC's line answers by itself, in the order in which they are looked for."""

from __future__ import annotations

from typing import Callable

from tools.stateful import phone as handset
from tools.stateful.phone import Phone, number_in

OK, ERROR, CME = "\r\nOK\r\n", "\r\nERROR\r\n", "\r\n+CME ERROR: 100\r\n"

# What stands behind the command, and the whole request; None is a refusal by a packet.
AtHandler = Callable[[Phone, str, str], "str | None"]


def value(name: str, shown: str) -> str:
    """A reply that shows a value."""
    return f"\r\n^{name}: {shown}\r\n{OK}"


def verdict(status: int) -> str:
    """The reply to a call of the platform."""
    return OK if status == 0 else ERROR


def operands(behind: str) -> list[str]:
    """What stands between commas up to the line's end; nothing between two is no operand."""
    line = behind.split("\0")[0].replace("\n", "\r").split("\r")[0]
    return [operand for operand in line.split(",") if operand]


def quoted(behind: str) -> str:
    """What stands in front of the closing quote, or of the line's end, at most 19 characters."""
    for end in '"\r\n\0':
        behind = behind.split(end)[0]
    return behind[:19]


def parameter(request: str, prefix: str) -> str:
    """What follows a prefix up to the first line end of the whole request."""
    start = request.find(prefix) + len(prefix)
    while request[start:start + 1] == " ":
        start += 1
    end = request.find("\r")
    end = len(request) if end < 0 else end
    found = request[start:end] if start < end else ""
    for stop in "\n\0":
        found = found.split(stop)[0]
    return found[:20]


def read_bt(phone: Phone, _: str, __: str) -> str:
    """The Bluetooth address of whichever file there is."""
    word = phone.word(handset.BT_FILES)
    return CME if word is None else value("DBTADDR", f'"{word}"')


def write_bt(phone: Phone, behind: str, _: str) -> str | None:
    """To the file that is there, else to where the first one goes."""
    address = quoted(behind)
    if not address:
        return None
    path = next((path for path in handset.BT_FILES if path in phone.files), handset.BT_FILES[0])
    phone.save(path, f"{address}\n")
    return OK


def read_wifi(phone: Phone, _: str, __: str) -> str:
    """The Wi-Fi address."""
    address = phone.wifi_address()
    return CME if address is None else value("DWIFIADDR", f'"{address}"')


def write_wifi(phone: Phone, behind: str, _: str) -> str:
    """An empty address is no address."""
    return OK if phone.write_wifi_address(quoted(behind)) else CME


def read_emmc(phone: Phone, _: str, __: str) -> str:
    """The memory's own words."""
    emmc = phone.emmc()
    return CME if emmc is None else value("DEMMCINFO", f'"{emmc}"')


def check_device(phone: Phone, _: str, request: str) -> str:
    """Wi-Fi, GPS or Bluetooth."""
    given = parameter(request, "AT^DDEVCONNCHK=")
    function = {0: "ldt_wifiCheck", 1: "ldt_gpsCheck", 3: "ldt_btCheck"}.get(number_in(given))
    return ERROR if function is None or not given else verdict(phone.call(function))


def control_bt(phone: Phone, _: str, request: str) -> str:
    """On or off."""
    given = parameter(request, "AT^DBTCTRL=")
    if not given or number_in(given) not in (0, 1):
        return ERROR
    return verdict(phone.call("ldt_btCtrl", number_in(given)))


def control_gps(phone: Phone, behind: str, _: str) -> str | None:
    """Stop, or start and read a satellite."""
    given = operands(behind)
    if not given:
        return None
    flag = number_in(given[0])
    if flag == 0:
        return verdict(phone.call("ldt_gpsCtrl", 0, 0, "null", "null"))
    if flag != 2 or phone.call("ldt_gpsCtrl", 1, 0, "null", "null") != 0 or len(given) < 2:
        return ERROR
    status, svid, cnr = phone.read_satellite(number_in(given[1]))
    return value("DGPSCTRL", f"{svid},{cnr}") if status == 0 else ERROR


def transmit(phone: Phone, behind: str, _: str) -> str | None:
    """Start with channel, rate and power, or stop."""
    given = operands(behind)
    if not given:
        return None
    control, *rest = (number_in(operand) for operand in given)
    if control == 0:
        test = phone.call("ldt_TxTest", 0, 0, 0, 0)
        radio = phone.call("ldt_wifiCtrl", 0)
        return verdict(test or radio)
    if control != 1 or phone.call("ldt_wifiCtrl", 1) != 0 or len(rest) < 3:
        return ERROR
    channel, rate, power = rest[:3]
    return verdict(phone.call("ldt_TxTest", 1, (power + 0x8000) % 0x10000 - 0x8000,
                              rate % 0x10000, channel % 0x100))


def receive(phone: Phone, behind: str, _: str) -> str | None:
    """Start with channel and rate, or stop on the channel of the last start."""
    given = operands(behind)
    if not given:
        return None
    control, *rest = (number_in(operand) for operand in given)
    if control == 0:
        test, _count = phone.stop_reception(phone.at_rx_channel)
        radio = phone.call("ldt_wifiCtrl", 0)
        return verdict(test or radio)
    if control != 1 or phone.call("ldt_wifiCtrl", 1) != 0 or len(rest) < 2:
        return ERROR
    channel = rest[0] % 0x100
    status = phone.call("ldt_RxTest", 1, channel, rest[1] % 0x10000, "null")
    phone.at_rx_channel = channel if status == 0 else phone.at_rx_channel
    return verdict(status)


def control_pcba(phone: Phone, behind: str, _: str) -> str | None:
    """Read or write the board's number."""
    given = operands(behind)
    if not given:
        return None
    operation = number_in(given[0])
    if operation == 1:
        line = phone.line(handset.PCBA_FILE, 98)
        return ERROR if line is None else value("DPCBACTRL", line[:29])
    if operation != 2:
        return ERROR
    if len(given) < 2:
        return None
    phone.save(handset.PCBA_FILE, given[1][:29])
    return OK


def permission(phone: Phone, behind: str, _: str) -> str | None:
    """The switch for starts by cable."""
    given = operands(behind)
    if not given:
        return None
    operation = number_in(given[0])
    flag = phone.permission(operation)
    if flag is None:
        return ERROR
    return value("DAMT1", str(flag)) if operation == 2 else OK


TABLE: tuple[tuple[str, AtHandler], ...] = (
    ("AT^DBTADDR?\r", read_bt),
    ("AT^DBTADDR=?\r", lambda *_: OK),
    ('AT^DBTADDR="', write_bt),
    ("AT^DWIFIADDR?\r", read_wifi),
    ("AT^DWIFIADDR=?\r", lambda *_: OK),
    ('AT^DWIFIADDR="', write_wifi),
    ("AT^DSVER\r", lambda phone, *_: value("DSVER", phone.software())),
    ("AT^DDEVCONNCHK=", check_device),
    ("AT^DBTCTRL=", control_bt),
    ("AT^DGPSCTRL=", control_gps),
    ("AT^DWLTSD=", transmit),
    ("AT^DWLTRD=", receive),
    ("AT^DPCBACTRL=", control_pcba),
    ("AT^DAMT1=", permission),
    ("AT^DENTERIDLE", lambda phone, *_: verdict(phone.call("enter_idle"))),
    ("AT^DBOOTDLFIN",
     lambda phone, *_: value("DBOOTDLFIN", str(phone.call("amt_check_system_sanity")))),
    ("AT^DEMMCINFO?\r", read_emmc),
)


def find(request: str) -> tuple[AtHandler, str] | None:
    """The command that is meant by a request, and what stands behind it."""
    for command, handler in TABLE:
        place = request.find(command)
        if place >= 0:
            return handler, request[place + len(command):]
    return None
