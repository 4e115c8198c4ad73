"""The simulated handset: a whole handset around the unmodified daemon, on a PC."""

from amt_simulator.control import Completed, HandsetControl, ProcessInfo
from amt_simulator.errors import HandsetError, HandsetTimeout
from amt_simulator.handset import Handset
from amt_simulator.kinds import KINDS
from amt_simulator.line import AppLine, Line
from amt_simulator.log import Log, Record

__all__ = ["AppLine", "Completed", "Handset", "HandsetControl", "HandsetError", "HandsetTimeout",
           "KINDS", "Line", "Log", "ProcessInfo", "Record"]
