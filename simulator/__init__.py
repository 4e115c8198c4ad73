"""The simulated handset: a whole handset around the unmodified daemon, on a PC."""

from .errors import HandsetError, HandsetTimeout
from .handset import Completed, Handset, ProcessInfo
from .kinds import KINDS
from .line import AppLine, Line
from .log import Log, Record

__all__ = ["AppLine", "Completed", "Handset", "HandsetError", "HandsetTimeout", "KINDS", "Line",
           "Log", "ProcessInfo", "Record"]
