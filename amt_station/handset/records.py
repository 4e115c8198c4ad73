"""What the typed commands bring, in the units that they name.

Made from the request table by ``python3 -m amt_station.handset_source``; do not change it by hand.
"""

from __future__ import annotations

from dataclasses import dataclass

from amt_station.handset.base import Result
from amt_station.handset.enums import Module, Permission, Sim, Step, Verdict


@dataclass(frozen=True)
class Version(Result):
    """What `version` brings."""

    module: Module | int
    """The module asked for."""

    version: str
    """Version text."""


@dataclass(frozen=True)
class BoardRead(Result):
    """What `board read` brings."""

    board: str
    """Board number, at most 38 characters."""


@dataclass(frozen=True)
class OutDateRead(Result):
    """What `out-date read` brings."""

    out_date: str
    """Out-date text, at most 14 characters."""


@dataclass(frozen=True)
class BatteryTemperature(Result):
    """What `battery temperature` brings."""

    temperature: float
    """Battery temperature, in °C."""


@dataclass(frozen=True)
class SerialNumberRead(Result):
    """What `serial-number read` brings."""

    serial_number: str
    """Serial number, at most 38 bytes."""


@dataclass(frozen=True)
class SimCheck(Result):
    """What `sim check` brings."""

    sim: Sim | int
    """1 when the SIM type is 1 or 2, else 0."""


@dataclass(frozen=True)
class ImeiRead(Result):
    """What `imei read` brings."""

    imei: str
    """IMEI, 15 bytes."""


@dataclass(frozen=True)
class BatteryVoltage(Result):
    """What `battery voltage` brings."""

    voltage: float
    """Battery voltage, in V."""


@dataclass(frozen=True)
class PcbaRead(Result):
    """What `pcba read` brings."""

    serial: str
    """The number read; not in the answer to a write."""


@dataclass(frozen=True)
class AdbSerialRead(Result):
    """What `adb-serial read` brings."""

    serial: str
    """The first word of the file; not in the answer to a write."""


@dataclass(frozen=True)
class BtAddressRead(Result):
    """What `bt-address read` brings."""

    address: str
    """The address read."""


@dataclass(frozen=True)
class WifiAddressRead(Result):
    """What `wifi-address read` brings."""

    address: str
    """The address read."""


@dataclass(frozen=True)
class TestResultRead(Result):
    """What `test-result read` brings."""

    station: int
    """Station number."""

    verdict: Verdict | int
    """1 pass, 2 fail, anything else unknown."""

    description: str | None = None
    """Test description, at most 127 characters."""


@dataclass(frozen=True)
class ItemResultRead(Result):
    """What `item-result read` brings."""

    station: int
    """Station number."""

    verdict: Verdict | int
    """1 pass, 2 fail, anything else unknown."""


@dataclass(frozen=True)
class ModeSupport(Result):
    """What `mode support` brings."""

    standby0_rat: int
    """The modem's standby0_rat value."""


@dataclass(frozen=True)
class Damt1Query(Result):
    """What `damt1 query` brings."""

    permission: Permission | int
    """0 denied, 1 allowed; meant for the query, app channel only."""


@dataclass(frozen=True)
class BootDownload(Result):
    """What `boot-download` brings."""

    flag: int
    """Verdict of the platform's sanity check, passed through."""


@dataclass(frozen=True)
class BatteryAdc(Result):
    """What `battery adc` brings."""

    adc: int
    """ADC value; 0 when the battery driver cannot be asked."""


@dataclass(frozen=True)
class TfCard(Result):
    """What `tf-card` brings."""

    capacity: int
    """Capacity, 0 without a card, in KB."""


@dataclass(frozen=True)
class CameraTest(Result):
    """What `camera test` brings."""

    outcome: int
    """The camera driver's result; 3 when the selected input is not there."""


@dataclass(frozen=True)
class DevInfo(Result):
    """What `dev-info` brings."""

    information: str
    """At most 4055 characters."""


@dataclass(frozen=True)
class EmmcInfo(Result):
    """What `emmc-info` brings."""

    information: str
    """First line of /sys/devinfo/emmc_info, at most 48 characters."""


@dataclass(frozen=True)
class WifiRxStop(Result):
    """What `wifi rx stop` brings."""

    packets: int
    """Packets received, only in the answer to the end of reception."""

    step: Step | int | None = None
    """The step asked for."""


@dataclass(frozen=True)
class GpsRead(Result):
    """What `gps read` brings."""

    cnr: int
    """Carrier-to-noise value."""

    satellite: int
    """Satellite id."""
