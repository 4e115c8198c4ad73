"""The requests that both lines serve, and those of the handset's own devices."""

from __future__ import annotations

from typing import Callable, Mapping

from amt_station import wire
from tools.stateful import phone as handset
from tools.stateful.phone import (REFUSED, Phone, Reply, answer, content, integer, number, signed,
                                  text)

Handler = Callable[[Phone, wire.Packet], Reply]


def bluetooth(phone: Phone, _: wire.Packet) -> Reply:
    """Answered by the service and by its child, which switches the chip on."""
    phone.call("ldt_btCtrl", 1)
    return Reply(0, answer(171).packets * 2)


def bluetooth_address(phone: Phone, packet: wire.Packet) -> Reply:
    """Read, write, check."""
    operation = number(packet, 110)
    if operation == 1:
        word = phone.word(handset.BT_FILES[:1])
        return REFUSED if word is None else answer(173, wire.Atom.string(111, word[:59]))
    if operation == 2:
        address = text(packet, 111, 59)
        phone.save(handset.BT_FILES[0], f"{address}\n" if address else "")
        return answer(173) if address else REFUSED
    if operation == 3 and phone.call("ldt_btCheck") == 0:
        return answer(173)
    return REFUSED


def wifi_address(phone: Phone, packet: wire.Packet) -> Reply:
    """Read, write, check."""
    operation = number(packet, 152)
    if operation == 0:
        address = phone.wifi_address()
        return REFUSED if address is None else answer(186, wire.Atom.string(153, address))
    if operation == 1:
        return answer(186) if phone.write_wifi_address(text(packet, 153, 59)) else REFUSED
    if operation == 2 and phone.call("ldt_wifiCheck") == 0:
        return answer(186)
    return REFUSED


def radio_test(phone: Phone, packet: wire.Packet) -> Reply:
    """The six steps of the Wi-Fi radio test, each noted in a file."""
    step = (content(packet, 154) or b"\0")[0]
    noted = f"the cmd value received from pc is : {step}\n"
    if not 1 <= step <= 6:
        noted += "the subcmd is invalid\n"
    phone.files[handset.WIFI_DEBUG] = phone.files.get(handset.WIFI_DEBUG, "") + noted
    echo = wire.Atom.raw(154, bytes([step]))
    if step in (1, 2):
        return answer(188, echo) if switch_radio(phone, step == 1) else REFUSED
    if not 1 <= step <= 6 or not phone.is_radio_on:
        return REFUSED
    if step == 6:
        status, count = phone.stop_reception(phone.rx_channel)
        return answer(188, echo, integer(158, count)) if status == 0 else REFUSED
    status = run_radio(phone, packet, step)
    return answer(188, echo) if status == 0 else REFUSED


def switch_radio(phone: Phone, is_on: bool) -> bool:
    """Whether the radio is as wanted now; it is asked for nothing that it does already."""
    if phone.is_radio_on != is_on:
        if phone.call("ldt_wifiCtrl", int(is_on)) != 0:
            return False
        phone.is_radio_on = is_on
    return True


def run_radio(phone: Phone, packet: wire.Packet, step: int) -> int:
    """Start a transmission (3) or a reception (5), or stop a transmission (4)."""
    channel, rate, power = (content(packet, atom) for atom in (155, 156, 157))
    if step == 4:
        return phone.call("ldt_TxTest", 0, 0, 0, 0)
    if channel is None or rate is None or step == 3 and power is None:
        return handset.FAILED
    shown = int.from_bytes(rate, "little")
    if step == 3:
        return phone.call("ldt_TxTest", 1, int.from_bytes(power or b"", "little"), shown,
                          channel[0])
    status = phone.call("ldt_RxTest", 1, channel[0], shown, "null")
    phone.rx_channel = channel[0] if status == 0 else phone.rx_channel
    return status


def gps_control(phone: Phone, packet: wire.Packet) -> Reply:
    """Stop, check; everything else starts."""
    operation = number(packet, 140)
    if operation == 2:
        status = phone.call("ldt_gpsCheck")
    else:
        status = phone.call("ldt_gpsCtrl", int(operation != 0), 0, "null", "null")
    return answer(175) if status == 0 else REFUSED


def gps_read(phone: Phone, packet: wire.Packet) -> Reply:
    """A satellite's signal."""
    status, svid, cnr = phone.read_satellite(number(packet, 141))
    return answer(179, integer(144, cnr), integer(141, svid)) if status == 0 else REFUSED


def enter_idle(phone: Phone, _: wire.Packet) -> Reply:
    """The library's verdict is the handler's status."""
    status = phone.call("enter_idle")
    return answer(241) if status == 0 else Reply(status)


BOTH: Mapping[int, Handler] = {
    170: bluetooth, 172: bluetooth_address, 174: gps_control, 176: lambda *_: answer(175),
    178: gps_read, 185: wifi_address, 187: radio_test, 240: enter_idle,
}


# of the app's line alone

def voltage(phone: Phone, _: wire.Packet) -> Reply:
    """As the kernel tells it."""
    return answer(10, integer(5, int(phone.files[handset.VOLTAGE_FILE])))


def temperature(phone: Phone, _: wire.Packet) -> Reply:
    """As the kernel tells it."""
    return answer(56, integer(22, int(phone.files[handset.TEMPERATURE_FILE])))


def vibrator(phone: Phone, packet: wire.Packet) -> Reply:
    """Everything but 0 starts it."""
    phone.files[handset.VIBRATOR_FILE] = "3000" if number(packet, 15, 1) != 0 else "0"
    return answer(36)


def button_light(phone: Phone, packet: wire.Packet) -> Reply:
    """The flag is the level."""
    phone.files[handset.BUTTON_FILE] = str(number(packet, 15, 1))
    return answer(38)


def lcd_light(phone: Phone, packet: wire.Packet) -> Reply:
    """A level that is none restores the one before the first."""
    if phone.first_lcd_level < 0:
        phone.first_lcd_level = int(phone.files[handset.LCD_FILE])
    level = number(packet, 26)
    shown = level if 0 <= level <= 255 else phone.first_lcd_level
    phone.files[handset.LCD_FILE] = str(shown if 0 <= shown <= 255 else 200)
    return answer(58)


def read_item(phone: Phone, packet: wire.Packet) -> Reply:
    """The item at the station's own number, one behind where a write puts it."""
    station = number(packet, 39)
    if station >= 36:
        return answer(229, result=10)
    items = phone.files.setdefault(handset.PRODUCT_RESULTS, "0\n" * 36)
    if station < 0:
        return answer(229, result=10)
    return answer(229, integer(39, station), integer(36, int(items[2 * station])))


def write_item(phone: Phone, packet: wire.Packet) -> Reply:
    """Stored in front of the station's number; in front of the smallest one is the largest."""
    stored = phone.store_result(handset.PRODUCT_RESULTS, signed(number(packet, 39) - 1),
                                number(packet, 36))
    return answer(231, result=0 if stored else 10)


def permission(phone: Phone, packet: wire.Packet) -> Reply:
    """The switch for starts by cable."""
    flag = phone.permission(number(packet, 192))
    if flag is None:
        return answer(220, result=10)
    return answer(220, integer(192, flag))


def camera(phone: Phone, packet: wire.Packet) -> Reply:
    """Which camera is previewed."""
    phone.calls.append(f"ioctl(video0, SARVOCAM_IOCTL_PREVIEW, {int(packet.command == 139)}) = 0")
    return answer(packet.command + 1)


APP: Mapping[int, Handler] = {
    **BOTH, 9: voltage, 35: vibrator, 37: button_light, 55: temperature, 57: lcd_light,
    139: camera, 147: camera, 219: permission, 228: read_item, 230: write_item,
}
