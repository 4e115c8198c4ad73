"""The typed commands of more than one word, in groups as they are typed.

Made from the request table by ``python3 -m amt_station.handset_source``; do not change it by hand.
"""

from __future__ import annotations

from amt_station.handset.base import Done, Group
from amt_station.handset.enums import Camera, Verdict
from amt_station.handset.records import (AdbSerialRead, BatteryAdc, BatteryTemperature,
                                         BatteryVoltage, BoardRead, BtAddressRead, CameraTest,
                                         Damt1Query, GpsRead, ImeiRead, ItemResultRead, ModeSupport,
                                         OutDateRead, PcbaRead, SerialNumberRead, SimCheck,
                                         TestResultRead, WifiAddressRead, WifiRxStop)
from amt_station.link import Link


class AudioLoopGroup(Group):
    """Commands that begin with `audio loop`."""

    def on(self, *, type: int | None = None, force: bool = False,
           timeout: float | None = None) -> Done:
        """Close an audio loop (app channel only). type: loop type, the audio library's."""
        return self._carry_out(Done, "audio loop on", {"type": type}, force, timeout)

    def off(self, *, type: int | None = None, force: bool = False,
            timeout: float | None = None) -> Done:
        """Open an audio loop (app channel only). type: loop type, the audio library's."""
        return self._carry_out(Done, "audio loop off", {"type": type}, force, timeout)


class CameraPreviewGroup(Group):
    """Commands that begin with `camera preview`."""

    def main(self, *, timeout: float | None = None) -> Done:
        """Preview of the main camera (app channel only)."""
        return self._carry_out(Done, "camera preview main", {}, False, timeout)

    def second(self, *, timeout: float | None = None) -> Done:
        """Preview of the second camera (app channel only)."""
        return self._carry_out(Done, "camera preview second", {}, False, timeout)


class WifiRxGroup(Group):
    """Commands that begin with `wifi rx`."""

    def start(self, *, channel: int, rate: int, force: bool = False,
              timeout: float | None = None) -> Done:
        """Start reception (either channel). channel: Wi-Fi channel. rate: rate, in hundredths of
        Mbit/s or as the test library takes it.
        """
        return self._carry_out(Done, "wifi rx start", {"channel": channel, "rate": rate}, force,
                               timeout)

    def stop(self, *, timeout: float | None = None) -> WifiRxStop:
        """Stop reception and read the packets received (either channel)."""
        return self._carry_out(WifiRxStop, "wifi rx stop", {}, False, timeout)


class WifiTxGroup(Group):
    """Commands that begin with `wifi tx`."""

    def start(self, *, channel: int, rate: int, power: int, force: bool = False,
              timeout: float | None = None) -> Done:
        """Start transmission (either channel). channel: Wi-Fi channel. rate: rate, in hundredths of
        Mbit/s or as the test library takes it. power: transmit power.
        """
        return self._carry_out(Done, "wifi tx start", {"channel": channel, "rate": rate, "power":
                               power}, force, timeout)

    def stop(self, *, timeout: float | None = None) -> Done:
        """Stop transmission (either channel)."""
        return self._carry_out(Done, "wifi tx stop", {}, False, timeout)


class AdbSerialGroup(Group):
    """Commands that begin with `adb-serial`."""

    def read(self, *, timeout: float | None = None) -> AdbSerialRead:
        """Read the adb serial number (PC line only)."""
        return self._carry_out(AdbSerialRead, "adb-serial read", {}, False, timeout)

    def write(self, *, serial: str, force: bool = False, timeout: float | None = None) -> Done:
        """Write the adb serial number (PC line only). serial: number to write, cut at the length.
        """
        return self._carry_out(Done, "adb-serial write", {"serial": serial}, force, timeout)


class AudioGroup(Group):
    """Commands that begin with `audio`."""

    def __init__(self, link: Link) -> None:
        super().__init__(link)
        self.loop = AudioLoopGroup(link)

    def play(self, *, timeout: float | None = None) -> Done:
        """Play the test sound (app channel only)."""
        return self._carry_out(Done, "audio play", {}, False, timeout)

    def stop(self, *, timeout: float | None = None) -> Done:
        """End the test sound (app channel only)."""
        return self._carry_out(Done, "audio stop", {}, False, timeout)


class BatteryGroup(Group):
    """Commands that begin with `battery`."""

    def temperature(self, *, timeout: float | None = None) -> BatteryTemperature:
        """Read the battery temperature (app channel only)."""
        return self._carry_out(BatteryTemperature, "battery temperature", {}, False, timeout)

    def voltage(self, *, timeout: float | None = None) -> BatteryVoltage:
        """Read the battery voltage (app channel only)."""
        return self._carry_out(BatteryVoltage, "battery voltage", {}, False, timeout)

    def adc(self, *, timeout: float | None = None) -> BatteryAdc:
        """Read the battery ADC (PC line only)."""
        return self._carry_out(BatteryAdc, "battery adc", {}, False, timeout)

    def calibrate(self, *, a: int, b: int, c: int, d: int, force: bool = False,
                  timeout: float | None = None) -> Done:
        """Store the battery ADC calibration (PC line only). a: calibration value 1. b: calibration
        value 2. c: calibration value 3. d: calibration value 4.
        """
        return self._carry_out(Done, "battery calibrate", {"a": a, "b": b, "c": c, "d": d}, force,
                               timeout)


class BluetoothGroup(Group):
    """Commands that begin with `bluetooth`."""

    def check(self, *, timeout: float | None = None) -> Done:
        """Check the Bluetooth hardware (either channel)."""
        return self._carry_out(Done, "bluetooth check", {}, False, timeout)

    def start(self, *, timeout: float | None = None) -> Done:
        """Switch the Bluetooth chip on and wait until it is (either channel)."""
        return self._carry_out(Done, "bluetooth start", {}, False, timeout)


class BoardGroup(Group):
    """Commands that begin with `board`."""

    def read(self, *, timeout: float | None = None) -> BoardRead:
        """Read the board number (either channel)."""
        return self._carry_out(BoardRead, "board read", {}, False, timeout)

    def write(self, *, board: str, force: bool = False, timeout: float | None = None) -> Done:
        """Write the board number (either channel). board: board number, at most 20 characters are
        kept.
        """
        return self._carry_out(Done, "board write", {"board": board}, force, timeout)


class BtAddressGroup(Group):
    """Commands that begin with `bt-address`."""

    def read(self, *, timeout: float | None = None) -> BtAddressRead:
        """Read the Bluetooth address (either channel)."""
        return self._carry_out(BtAddressRead, "bt-address read", {}, False, timeout)

    def write(self, *, address: str, force: bool = False, timeout: float | None = None) -> Done:
        """Write the Bluetooth address (either channel). address: address to write, at most 59
        characters.
        """
        return self._carry_out(Done, "bt-address write", {"address": address}, force, timeout)


class ButtonBacklightGroup(Group):
    """Commands that begin with `button-backlight`."""

    def on(self, *, timeout: float | None = None) -> Done:
        """Light the buttons (app channel only)."""
        return self._carry_out(Done, "button-backlight on", {}, False, timeout)

    def off(self, *, timeout: float | None = None) -> Done:
        """Darken the buttons (app channel only)."""
        return self._carry_out(Done, "button-backlight off", {}, False, timeout)


class CameraGroup(Group):
    """Commands that begin with `camera`."""

    def __init__(self, link: Link) -> None:
        super().__init__(link)
        self.preview = CameraPreviewGroup(link)

    def test(self, *, camera: Camera, force: bool = False,
             timeout: float | None = None) -> CameraTest:
        """Camera self-test (app channel only). camera: 1 main, 2 second camera."""
        return self._carry_out(CameraTest, "camera test", {"camera": camera}, force, timeout)


class Damt1Group(Group):
    """Commands that begin with `damt1`."""

    def deny(self, *, timeout: float | None = None) -> Done:
        """Deny entry by USB insertion (either channel)."""
        return self._carry_out(Done, "damt1 deny", {}, False, timeout)

    def allow(self, *, timeout: float | None = None) -> Done:
        """Allow entry by USB insertion (app channel only)."""
        return self._carry_out(Done, "damt1 allow", {}, False, timeout)

    def query(self, *, timeout: float | None = None) -> Damt1Query:
        """Ask for the permission (app channel only)."""
        return self._carry_out(Damt1Query, "damt1 query", {}, False, timeout)


class GpsGroup(Group):
    """Commands that begin with `gps`."""

    def start(self, *, timeout: float | None = None) -> Done:
        """Start the GPS (either channel)."""
        return self._carry_out(Done, "gps start", {}, False, timeout)

    def stop(self, *, timeout: float | None = None) -> Done:
        """Stop the GPS (either channel)."""
        return self._carry_out(Done, "gps stop", {}, False, timeout)

    def check(self, *, timeout: float | None = None) -> Done:
        """Check the GPS chip (either channel)."""
        return self._carry_out(Done, "gps check", {}, False, timeout)

    def test(self, *, timeout: float | None = None) -> Done:
        """GPS test (answered only) (either channel)."""
        return self._carry_out(Done, "gps test", {}, False, timeout)

    def read(self, *, index: int, force: bool = False, timeout: float | None = None) -> GpsRead:
        """Read the signal of a satellite (either channel). index: satellite index."""
        return self._carry_out(GpsRead, "gps read", {"index": index}, force, timeout)


class ImeiGroup(Group):
    """Commands that begin with `imei`."""

    def write(self, *, imei: str, force: bool = False, timeout: float | None = None) -> Done:
        """Write the IMEI (either channel). imei: IMEI, at most 20 characters are kept."""
        return self._carry_out(Done, "imei write", {"imei": imei}, force, timeout)

    def read(self, *, timeout: float | None = None) -> ImeiRead:
        """Read the IMEI (either channel)."""
        return self._carry_out(ImeiRead, "imei read", {}, False, timeout)


class ItemResultGroup(Group):
    """Commands that begin with `item-result`."""

    def read(self, *, station: int, force: bool = False,
             timeout: float | None = None) -> ItemResultRead:
        """Read an item (counted from 0) (app channel only). station: item index, counted from 0."""
        return self._carry_out(ItemResultRead, "item-result read", {"station": station}, force,
                               timeout)

    def write(self, *, station: int, verdict: Verdict, force: bool = False,
              timeout: float | None = None) -> Done:
        """Store an item (counted from 1) (app channel only). station: item number, counted from 1.
        verdict: 1 pass, 2 fail, anything else unknown.
        """
        return self._carry_out(Done, "item-result write", {"station": station, "verdict": verdict},
                               force, timeout)


class LcdGroup(Group):
    """Commands that begin with `lcd`."""

    def show(self, *, timeout: float | None = None) -> Done:
        """LCD test (answered only) (app channel only)."""
        return self._carry_out(Done, "lcd show", {}, False, timeout)


class LcdBrightnessGroup(Group):
    """Commands that begin with `lcd-brightness`."""

    def set(self, *, level: int, force: bool = False, timeout: float | None = None) -> Done:
        """Set the LCD backlight (app channel only). level: 0 to 255; any other restores the level
        found before the first request.
        """
        return self._carry_out(Done, "lcd-brightness set", {"level": level}, force, timeout)

    def restore(self, *, timeout: float | None = None) -> Done:
        """Restore the LCD backlight (app channel only)."""
        return self._carry_out(Done, "lcd-brightness restore", {}, False, timeout)


class ModeGroup(Group):
    """Commands that begin with `mode`."""

    def enter(self, *, mode: int, force: bool = False, timeout: float | None = None) -> Done:
        """Enter the factory-test mode (app channel only). mode: mode value handed to the modem."""
        return self._carry_out(Done, "mode enter", {"mode": mode}, force, timeout)

    def support(self, *, timeout: float | None = None) -> ModeSupport:
        """Ask the modem for its support (app channel only)."""
        return self._carry_out(ModeSupport, "mode support", {}, False, timeout)


class OutDateGroup(Group):
    """Commands that begin with `out-date`."""

    def read(self, *, timeout: float | None = None) -> OutDateRead:
        """Read the out-date record (either channel)."""
        return self._carry_out(OutDateRead, "out-date read", {}, False, timeout)


class PcbaGroup(Group):
    """Commands that begin with `pcba`."""

    def read(self, *, timeout: float | None = None) -> PcbaRead:
        """Read the PCBA serial number (PC line only)."""
        return self._carry_out(PcbaRead, "pcba read", {}, False, timeout)

    def write(self, *, serial: str, force: bool = False, timeout: float | None = None) -> Done:
        """Write the PCBA serial number (PC line only). serial: number to write, at most 29
        characters.
        """
        return self._carry_out(Done, "pcba write", {"serial": serial}, force, timeout)


class SerialNumberGroup(Group):
    """Commands that begin with `serial-number`."""

    def read(self, *, timeout: float | None = None) -> SerialNumberRead:
        """Read the modem's serial number (either channel)."""
        return self._carry_out(SerialNumberRead, "serial-number read", {}, False, timeout)


class SimGroup(Group):
    """Commands that begin with `sim`."""

    def check(self, *, timeout: float | None = None) -> SimCheck:
        """Check for a SIM (either channel)."""
        return self._carry_out(SimCheck, "sim check", {}, False, timeout)


class TestResultGroup(Group):
    """Commands that begin with `test-result`."""

    def write(self, *, station: int, verdict: Verdict, description: str | None = None,
              force: bool = False, timeout: float | None = None) -> Done:
        """Store a station's verdict (either channel). station: station number; 0 to 19 are mirrored
        in /amt/amt_result.txt. verdict: 1 pass, 2 fail, anything else unknown. description: test
        description, at most 126 characters; app channel only.
        """
        return self._carry_out(Done, "test-result write", {"station": station, "verdict": verdict,
                               "description": description}, force, timeout)

    def read(self, *, station: int, force: bool = False,
             timeout: float | None = None) -> TestResultRead:
        """Read a station's verdict (either channel). station: station number."""
        return self._carry_out(TestResultRead, "test-result read", {"station": station}, force,
                               timeout)


class VibratorGroup(Group):
    """Commands that begin with `vibrator`."""

    def on(self, *, timeout: float | None = None) -> Done:
        """Run the vibrator for 3 s (app channel only)."""
        return self._carry_out(Done, "vibrator on", {}, False, timeout)

    def off(self, *, timeout: float | None = None) -> Done:
        """Stop the vibrator (app channel only)."""
        return self._carry_out(Done, "vibrator off", {}, False, timeout)


class WifiGroup(Group):
    """Commands that begin with `wifi`."""

    def __init__(self, link: Link) -> None:
        super().__init__(link)
        self.rx = WifiRxGroup(link)
        self.tx = WifiTxGroup(link)

    def check(self, *, timeout: float | None = None) -> Done:
        """Check the Wi-Fi chip (either channel)."""
        return self._carry_out(Done, "wifi check", {}, False, timeout)

    def start(self, *, timeout: float | None = None) -> Done:
        """Put the Wi-Fi chip into test mode (either channel)."""
        return self._carry_out(Done, "wifi start", {}, False, timeout)

    def stop(self, *, timeout: float | None = None) -> Done:
        """Take the Wi-Fi chip out of test mode (either channel)."""
        return self._carry_out(Done, "wifi stop", {}, False, timeout)


class WifiAddressGroup(Group):
    """Commands that begin with `wifi-address`."""

    def read(self, *, timeout: float | None = None) -> WifiAddressRead:
        """Read the Wi-Fi address (either channel)."""
        return self._carry_out(WifiAddressRead, "wifi-address read", {}, False, timeout)

    def write(self, *, address: str, force: bool = False, timeout: float | None = None) -> Done:
        """Write the Wi-Fi address (either channel). address: address to write, at most 59
        characters.
        """
        return self._carry_out(Done, "wifi-address write", {"address": address}, force, timeout)
