"""Where a run takes place: the station's name, the operator, the directory of records."""

from __future__ import annotations

import getpass
import socket
from pathlib import Path

from amt_station.state import state_directory


def records_directory() -> Path:
    """Where records go unless something else is said."""
    return state_directory() / "records"


def station_name() -> str:
    """The name of this machine."""
    return socket.gethostname()


def operator_name() -> str:
    """Who is logged in; empty when the system does not know."""
    try:
        return getpass.getuser()
    except (KeyError, OSError):
        return ""
