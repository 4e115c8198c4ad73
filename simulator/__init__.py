"""The simulated handset: a whole handset around the unmodified daemon, on a PC."""

from .control import Completed, HandsetControl, ProcessInfo
from .errors import HandsetError, HandsetTimeout
from .handset import Handset
from .kinds import KINDS
from .line import AppLine, Line
from .log import Log, Record

__all__ = ["AppLine", "Completed", "Handset", "HandsetControl", "HandsetError", "HandsetTimeout",
           "KINDS", "Line", "Log", "ProcessInfo", "Record"]
