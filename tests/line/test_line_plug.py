"""Where a handset is plugged in: what is seen there, and whether it is another one."""

from __future__ import annotations

import os
from pathlib import Path
from typing import Any

import pytest

from amt_line.run import plug
from amt_line.run.plug import Listing, PathPlug, UrlPlug, UsbPlug, open_again, plug_of
from amt_station.errors import NoPort
from amt_station.found_ports import FoundPort

LEFT = FoundPort("/dev/ttyACM0", "handset", 0x1234, 0x5678, "K1", "1-2.3:1.0")
RIGHT = FoundPort("/dev/ttyACM1", "handset", 0x1234, 0x5678, "K2", "1-2.4")


def listing(*ports: FoundPort) -> Listing:
    return Listing(lambda: list(ports))


@pytest.mark.parametrize("text, kind", [
    ("/dev/ttyS0", PathPlug), ("usb:1-2.3", UsbPlug), ("socket://bench:4000", UrlPlug),
    ("loop://", UrlPlug)])
def test_what_a_text_names(text: str, kind: type) -> None:
    assert isinstance(plug_of(text, listing()), kind)
    assert plug_of(text, listing()).name == text


@pytest.mark.parametrize("location, device", [
    ("1-2.3", "/dev/ttyACM0"), ("1-2.3:1.0", "/dev/ttyACM0"), ("1-2.4", "/dev/ttyACM1"),
    ("1-2.3:1.2", None), ("1-2", None)])
def test_a_socket_of_the_usb_tree(location: str, device: str | None) -> None:
    seen = UsbPlug(location, listing(LEFT, RIGHT, FoundPort("/dev/ttyS0"))).look()
    assert (seen.url if seen is not None else None) == device


def test_another_handset_in_the_same_socket_has_another_mark(monkeypatch: Any) -> None:
    ports = [LEFT]
    found = Listing(lambda: list(ports))
    monkeypatch.setattr(plug, "_LISTING_SECONDS", 0.0)
    place = UsbPlug("1-2.3", found)
    first = place.look()
    assert first is not None and place.look() == first
    ports[0] = FoundPort("/dev/ttyACM0", "handset", 0x1234, 0x5678, "K9", "1-2.3:1.0")
    assert place.look() != first
    # The same one, plugged in again: the kernel has numbered it anew.
    ports[0] = LEFT
    monkeypatch.setattr(plug, "usb_device", lambda path: "1-2.3 17")
    assert place.look() != first
    ports.clear()
    assert place.look() is None
    with pytest.raises(NoPort, match="no port usb:1-2.3"):
        open_again(place)


def test_the_listing_is_made_once_for_all_slots(monkeypatch: Any) -> None:
    monkeypatch.setattr(plug, "_LISTING_SECONDS", 3600.0)
    looks: list[int] = []

    def find() -> list[FoundPort]:
        looks.append(1)
        return [LEFT]

    found = Listing(find)
    for _ in range(100):
        UsbPlug("1-2.3", found).look()
    assert len(looks) == 1


def test_a_link_that_leads_elsewhere_is_another_handset(tmp_path: Path) -> None:
    link = tmp_path / "handset"
    place = PathPlug(str(link))
    assert place.look() is None
    link.symlink_to("/dev/null")
    first = place.look()
    assert first is not None and place.look() == first and not place.stays
    fresh = tmp_path / "fresh"
    fresh.symlink_to("/dev/zero")
    os.replace(fresh, link)
    assert place.look() != first


def test_what_stays_when_its_handset_goes() -> None:
    assert PathPlug("/dev/null").stays and UrlPlug("loop://").stays
    assert not PathPlug("/dev/null", stays=False).stays
    assert not UsbPlug("1-2", listing()).stays
    assert plug.usb_device("/dev/null") == plug.usb_device("/no/such") == ""
