"""Every typed command as a method, those of more than one word in groups.

Made from the request table by ``python3 -m amt_station.handset_source``; do not change it by hand.
"""

from __future__ import annotations

from amt_station.handset.base import Done, Group
from amt_station.handset.enums import Module
from amt_station.handset.groups import (AdbSerialGroup, AudioGroup, BatteryGroup, BluetoothGroup,
                                        BoardGroup, BtAddressGroup, ButtonBacklightGroup,
                                        CameraGroup, Damt1Group, GpsGroup, ImeiGroup,
                                        ItemResultGroup, LcdBrightnessGroup, LcdGroup, ModeGroup,
                                        OutDateGroup, PcbaGroup, SerialNumberGroup, SimGroup,
                                        TestResultGroup, VibratorGroup, WifiAddressGroup, WifiGroup)
from amt_station.handset.records import BootDownload, DevInfo, EmmcInfo, TfCard, Version
from amt_station.link import Link


class Commands(Group):
    """Every typed command of the request table."""

    def __init__(self, link: Link) -> None:
        super().__init__(link)
        self.adb_serial = AdbSerialGroup(link)
        self.audio = AudioGroup(link)
        self.battery = BatteryGroup(link)
        self.bluetooth = BluetoothGroup(link)
        self.board = BoardGroup(link)
        self.bt_address = BtAddressGroup(link)
        self.button_backlight = ButtonBacklightGroup(link)
        self.camera = CameraGroup(link)
        self.damt1 = Damt1Group(link)
        self.gps = GpsGroup(link)
        self.imei = ImeiGroup(link)
        self.item_result = ItemResultGroup(link)
        self.lcd = LcdGroup(link)
        self.lcd_brightness = LcdBrightnessGroup(link)
        self.mode = ModeGroup(link)
        self.out_date = OutDateGroup(link)
        self.pcba = PcbaGroup(link)
        self.serial_number = SerialNumberGroup(link)
        self.sim = SimGroup(link)
        self.test_result = TestResultGroup(link)
        self.vibrator = VibratorGroup(link)
        self.wifi = WifiGroup(link)
        self.wifi_address = WifiAddressGroup(link)

    def version(self, *, module: Module, force: bool = False,
                timeout: float | None = None) -> Version:
        """Version text of a module (either channel). module: which module."""
        return self._carry_out(Version, "version", {"module": module}, force, timeout)

    def channel_switch(self, *, channel: int, force: bool = False,
                       timeout: float | None = None) -> Done:
        """Switch the modem channel (either channel). channel: modem channel."""
        return self._carry_out(Done, "channel-switch", {"channel": channel}, force, timeout)

    def power_off(self, *, timeout: float | None = None) -> Done:
        """Power the handset off (PC line only)."""
        return self._carry_out(Done, "power-off", {}, False, timeout)

    def idle(self, *, timeout: float | None = None) -> Done:
        """Put the handset into idle (either channel)."""
        return self._carry_out(Done, "idle", {}, False, timeout)

    def boot_download(self, *, timeout: float | None = None) -> BootDownload:
        """Read the boot-download-finished flag (PC line only)."""
        return self._carry_out(BootDownload, "boot-download", {}, False, timeout)

    def tf_card(self, *, timeout: float | None = None) -> TfCard:
        """Read the memory card's capacity (app channel only)."""
        return self._carry_out(TfCard, "tf-card", {}, False, timeout)

    def dev_info(self, *, timeout: float | None = None) -> DevInfo:
        """Read the device information (app channel only)."""
        return self._carry_out(DevInfo, "dev-info", {}, False, timeout)

    def emmc_info(self, *, timeout: float | None = None) -> EmmcInfo:
        """Read the eMMC information (PC line only)."""
        return self._carry_out(EmmcInfo, "emmc-info", {}, False, timeout)
