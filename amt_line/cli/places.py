"""Where a run takes place: the station's name, the operator, the directory of records."""

from __future__ import annotations

import getpass
import socket

from amt_station.state import records_directory

__all__ = ["operator_name", "records_directory", "station_name"]


def station_name() -> str:
    """The name of this machine."""
    return socket.gethostname()


def operator_name() -> str:
    """Who is logged in; empty when the system does not know."""
    try:
        return getpass.getuser()
    except (KeyError, OSError):
        return ""
