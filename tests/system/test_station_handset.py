"""The station's typed interface against the daemon itself, by the station's pytest plugin."""

import subprocess
import sys
from pathlib import Path

import pytest

PROJECT = Path(__file__).resolve().parents[2]

PC_TESTS = """
import pytest

from amt_station import Module, Refused, Verdict


def test_reads(handset):
    assert handset.version(module=Module.SOFTWARE).module is Module.SOFTWARE
    assert isinstance(handset.battery.adc().adc, int)
    assert handset.at("AT").lines == ()


def test_what_is_written_is_read(handset):
    handset.adb_serial.write(serial="ADB0042")
    assert handset.adb_serial.read().serial == "ADB0042"
    handset.bt_address.write(address="00:11:22:33:44:55")
    assert handset.bt_address.read().address == "00:11:22:33:44:55"


def test_a_number_never_written_is_refused_and_not_held(handset):
    with pytest.raises(Refused) as caught:
        handset.pcba.read()
    assert not caught.value.held
    assert handset.link.recover().attempts == 1
"""

APP_TESTS = """
from amt_station import Module, Verdict


def test_reads(handset):
    assert 3 < handset.battery.voltage().voltage < 5
    assert handset.version(module=Module.PRODUCT).version


def test_results(handset):
    handset.item_result.write(station=1, verdict=Verdict.PASS)
    assert handset.item_result.read(station=0).verdict is Verdict.PASS
"""


@pytest.mark.parametrize("channel, tests", [("pc", PC_TESTS), ("app", APP_TESTS)],
                         ids=["pc", "app"])
def test_the_plugin_brings_a_handset_up(channel: str, tests: str, tmp_path: Path,
                                        handset_build: "str | Path") -> None:
    (tmp_path / "test_handset.py").write_text(tests, encoding="utf-8")
    result = subprocess.run(
        [sys.executable, "-m", "pytest", "-q", "-p", "amt_station.pytest_plugin", "-p",
         "no:cacheprovider", "--rootdir", str(tmp_path), "--amt-channel", channel,
         "--amt-build", str(handset_build), str(tmp_path)],
        cwd=PROJECT, capture_output=True, text=True, timeout=150, check=False)
    assert result.returncode == 0, result.stdout + result.stderr
