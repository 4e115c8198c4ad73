"""Run the acts: `./dev demo`."""

import argparse
import tempfile
import time
from pathlib import Path

from amt_simulator import Handset
from amt_simulator.errors import HandsetError
from amt_simulator.waiting import wait_until
from amt_station.errors import StationError
from amt_station.link import Link
from amt_station.requests.model import Channel
from amt_station.wire.packet import Packet
from tools.build import build
from tools.demo import line
from tools.demo.stage import Stage
from tools.project import PROJECT

IMEI = "490154203237518"
SERIAL = "KEL0000000042"
BT_ADDRESS = "00:1A:7D:DA:71:13"
WIFI_ADDRESS = "00:1A:7D:DA:71:14"
PCBA = "PCBA-2026-000123"
PICTURE = PROJECT / "build" / "demo" / "handshake.png"
PICTURE_SECONDS = 15.0


def serve_pc(stage: Stage) -> None:
    """The station at the PC line: AT text, packets, and what is passed to the modem."""
    stage.act("1  The station at the PC line")
    with Handset("pc", ports=True) as handset:
        handset.wait_ready()
        stage.say(f"station port {handset.directory / 'pc'}")
        with Link.open(str(handset.directory / "pc")) as link:
            stage.at(link, "probe: enters AT mode", "AT")
            write_identity(stage, handset, link)
            use_packets(stage, link)
            be_refused(stage, link)


def write_identity(stage: Stage, handset: Handset, link: Link) -> None:
    """Identity data: through the modem, and the daemon's own."""
    stage.at(link, "IMEI, through the modem", f"AT^DCGSNW={IMEI}")
    stage.file(handset, "/amt/imei.txt", IMEI)
    stage.at(link, "serial number, likewise", f"AT^DMSN={SERIAL}")
    stage.file(handset, "/amt/sn.txt", SERIAL)
    stage.at(link, "Bluetooth address", f'AT^DBTADDR="{BT_ADDRESS}"')
    stage.at(link, "  read back", "AT^DBTADDR?", BT_ADDRESS)
    stage.file(handset, "/amt/BT/BT_Address.txt", BT_ADDRESS + "\n")
    stage.at(link, "Wi-Fi address", f'AT^DWIFIADDR="{WIFI_ADDRESS}"')
    stage.file(handset, "/amt/WIFI/WIFI_nvram.txt", WIFI_ADDRESS + "\n")
    stage.at(link, "PCBA number", f"AT^DPCBACTRL=2,{PCBA}")
    stage.at(link, "text for the modem", "AT+CGMM")


def use_packets(stage: Stage, link: Link) -> None:
    """Packets: acknowledged and answered here, or passed to the modem."""
    stage.operation(link, "PCBA number, by packet", ("pcba", "read"), {}, {"serial": PCBA})
    stage.operation(link, "software version", ("version",), {"module": 16})
    stage.operation(link, "GPS check", ("gps", "check"))
    stage.operation(link, "GPS signal", ("gps", "read"), {"index": 3})
    stage.operation(link, "IMEI, passed to the modem", ("imei", "write"), {"imei": IMEI})


def be_refused(stage: Stage, link: Link) -> None:
    """A request that the handset refuses, and the way out."""
    stage.refused("an empty address", '-> AT^DBTADDR=""', lambda: link.at('AT^DBTADDR=""'))
    recovery = link.recover()
    stage.check("the held text is flushed", f"after {recovery.attempts} attempt(s)", True)
    stage.at(link, "served again", "AT^DPCBACTRL=1", PCBA)


def serve_app(stage: Stage) -> None:
    """The test app at its pseudo-terminal."""
    stage.act("2  The test app on the handset")
    with Handset("packet", ports=True) as handset:
        handset.wait_ready()
        with Link.open(str(handset.directory / "app"), Channel.APP) as link:
            ask_modem(stage, link)
            keep_results(stage, handset, link)
            test_devices(stage, handset, link)


def ask_modem(stage: Stage, link: Link) -> None:
    """What the modem knows."""
    stage.operation(link, "version of the L1 module", ("version",), {"module": 17})
    stage.operation(link, "board number", ("board", "read"))
    stage.operation(link, "out-date record", ("out-date", "read"))
    stage.operation(link, "SIM", ("sim", "check"))
    stage.operation(link, "IMEI, through the tunnel", ("imei", "read"))


def keep_results(stage: Stage, handset: Handset, link: Link) -> None:
    """Verdicts of test stations."""
    stage.operation(link, "station 3 has passed", ("test-result", "write"),
                    {"station": 3, "verdict": 1, "description": "RF calibration"})
    stage.operation(link, "  read back", ("test-result", "read"), {"station": 3},
                    {"station": 3, "verdict": 1})
    stage.check("mirrored in its file", handset.text("/amt/amt_result.txt")[:10].replace("\n", " "),
                handset.text("/amt/amt_result.txt")[6:8] == "1\n")


def test_devices(stage: Stage, handset: Handset, link: Link) -> None:
    """The handset's own hardware."""
    stage.act("3  The handset's devices")
    stage.operation(link, "battery", ("battery", "voltage"))
    stage.operation(link, "battery temperature", ("battery", "temperature"))
    stage.operation(link, "memory card", ("tf-card",), {}, {"capacity": 64 * 1024})
    stage.operation(link, "vibrator", ("vibrator", "on"))
    stage.check("  its driver got", handset.text("/sys/class/timed_output/vibrator/enable"), True)
    stage.operation(link, "screen brightness", ("lcd-brightness", "set"), {"level": 120})
    stage.operation(link, "camera", ("camera", "test"), {"camera": 1})
    stage.operation(link, "Bluetooth", ("bluetooth", "check"))
    stage.operation(link, "Wi-Fi into test mode", ("wifi", "start"))
    stage.operation(link, "Wi-Fi transmits", ("wifi", "tx", "start"),
                    {"channel": 6, "rate": 540, "power": 15})
    stage.operation(link, "Wi-Fi stops", ("wifi", "tx", "stop"))
    stage.operation(link, "device information", ("dev-info",))
    stage.refused("an id that nobody serves", "-> 200", lambda: link.request(Packet(200, ())))


def insert_cable(stage: Stage) -> None:
    """A start by cable: the handshake and its picture."""
    stage.act("4  Started by the USB cable: the handshake")
    with Handset("usb-inserted", ports=True) as handset:
        handset.wait_ready()
        with Link.open(str(handset.directory / "pc")) as link:
            stage.at(link, "the station's first data", "AT")
            stage.at(link, "data in time: handshake", "AT")
            handset.log.wait("handshake success.")
            stage.check("the daemon's log", "handshake success.", True)
        wait_until(lambda: any("EN_LAYER, 1" in call for call in handset.calls()) or None,
                   "the picture to be shown", PICTURE_SECONDS)
        stage.picture(handset, PICTURE)


def main() -> int:
    """Play every act and give the verdict."""
    argparse.ArgumentParser(prog="./dev demo", description=__doc__).parse_args()
    build("release", ("--target", "handset"))
    PICTURE.parent.mkdir(parents=True, exist_ok=True)
    started = time.monotonic()
    stage = Stage()
    try:
        for act in (serve_pc, serve_app, insert_cable):
            act(stage)
        with tempfile.TemporaryDirectory(prefix="demo-line-") as folder:
            line.play(stage, Path(folder))
    except (HandsetError, StationError, TimeoutError) as error:
        stage.check("the handset", str(error), False)
    print(f"\n{time.monotonic() - started:.0f} seconds", end="")
    return stage.verdict()
