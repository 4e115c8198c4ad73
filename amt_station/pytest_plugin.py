"""pytest with a handset: the fixture ``handset``, on a port or simulated.

Installed with the package under the name ``amt_station``; ``--amt-port`` names the port, without it
a simulated handset is brought up for the whole session.
"""

from __future__ import annotations

from typing import TYPE_CHECKING, Iterator

import pytest

if TYPE_CHECKING:
    from amt_station.handset import Handset

_PATHS = {"pc": "pc", "app": "packet"}


def pytest_addoption(parser: pytest.Parser) -> None:
    """Options that say where the handset is."""
    group = parser.getgroup("amt_station", "a handset under test")
    group.addoption("--amt-port", metavar="URL",
                    help="port to the handset, any pySerial URL (default: a simulated handset)")
    group.addoption("--amt-channel", choices=sorted(_PATHS), default="pc",
                    help="which line of the handset the port is (default: %(default)s)")
    group.addoption("--amt-build", metavar="BUILD", default="release",
                    help="build whose daemon a simulated handset runs (default: %(default)s)")


@pytest.fixture(scope="session")
def amt_port(request: pytest.FixtureRequest) -> Iterator[str]:
    """The port to the handset, which is brought up first when it is a simulated one."""
    port = request.config.getoption("--amt-port")
    if port:
        yield str(port)
        return
    from amt_simulator import Handset as Simulated
    from amt_simulator.errors import HandsetError

    channel = str(request.config.getoption("--amt-channel"))
    try:
        simulated = Simulated(_PATHS[channel], str(request.config.getoption("--amt-build")),
                              ports=True)
        simulated.up()
    except HandsetError as error:
        pytest.fail(f"no --amt-port is named, and no handset can be simulated: {error}",
                    pytrace=False)
    try:
        simulated.wait_ready()
        yield str(simulated.directory / channel)
    finally:
        simulated.down()


@pytest.fixture
def handset(request: pytest.FixtureRequest, amt_port: str) -> Iterator[Handset]:
    """A handset with a method for every typed command, in step."""
    from amt_station.handset import connect
    from amt_station.requests.model import Channel

    channel = Channel(str(request.config.getoption("--amt-channel")))
    with connect(amt_port, channel=channel) as connected:
        connected.find_place()
        yield connected
