"""Channel traffic as the log shows it, and the moments at which a reader waits for more."""

import re

from amt_simulator import Handset
from support.trace import Trace

DUMP_SIZE = 250
PC_IN, PC_OUT = "handle PC req data: ", "send PC rsp data: "
APP_IN, APP_OUT = "handle APP req data: ", "send APP rsp data: "
MODEM_IN, MODEM_OUT = "receive Modem data: ", "write to modem: "
PC_WAITS = re.compile(r"read_pc_loop, read ready, m_fd_pc=\d+")


def dump(title: str, data: bytes) -> str:
    """The log line that shows DATA."""
    rest = "..." if len(data) > DUMP_SIZE else ""
    return f"{title}: (data_len = {len(data)}) -- {data[:DUMP_SIZE].hex().upper()}{rest}"


class PcTrace(Trace):
    """A trace of the PC reader, begun while it waits for data."""

    def __init__(self, handset: Handset) -> None:
        self._start = handset.log.mark()
        super().__init__(handset)

    def wait_served(self) -> None:
        """Wait until the reader has served what it got and waits again."""
        self._handset.log.wait(PC_WAITS, after=self._start)
