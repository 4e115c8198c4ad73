"""What one handler has logged, line by line, and the answers that the device requests share."""

import re
from typing import Union

from amt_simulator import Handset
from amt_station import wire
from support.channels import AppChannel, PcChannel, integer, packet
from support.trace import Trace, Wanted, error_line

DEVICE, GPS = "amt/amt-device", "amt/amt-gps"
NO_ENTRY, IO_ERROR, BUSY, NO_DEVICE, IS_DIRECTORY, INVALID, NO_SPACE = 2, 5, 16, 19, 21, 22, 28
# What follows a handler's own lines: the wrapping or sending of its answer, the captures of the PC
# reader when there is none, or the next request.
HANDLER_ENDS = re.compile(r"^(amt_convert_app_2_pc\(\)|handle_amt_imei_and_sn--->|"
                          r"(send|handle) (APP|PC) (rsp|req) data: )")


def device_error(func: str, code: int, errno: int | None = None) -> "re.Pattern[str]":
    """The error line of a device handler."""
    return error_line(func, code, errno, source=DEVICE)


def gps_error(func: str, code: int, errno: int | None = None) -> "re.Pattern[str]":
    """The error line of a GPS handler."""
    return error_line(func, code, errno, source=GPS)


def done(command: int, *atoms: wire.Atom) -> wire.Packet:
    """The answer to a request that was carried out."""
    return packet(command + 1, *atoms, integer(1, 0))


def refusal(command: int) -> wire.Packet:
    """The dispatcher's answer to a request that its handler refused."""
    return packet(command + 1, integer(1, 1))


def refused(channel: Union[AppChannel, PcChannel], command: int, *atoms: wire.Atom) -> None:
    """The request is answered by the dispatcher's error packet alone."""
    assert channel.request(command, *atoms) == refusal(command)


class HandlerTrace(Trace):
    """What comes after its making, looked at handler by handler."""

    def __init__(self, handset: Handset) -> None:
        super().__init__(handset)
        self._from = handset.log.mark()

    def lines(self, handler: str) -> list[str]:
        """The lines of the first call of HANDLER that was not asked for yet, its entry line first.

        They end where its answer is made ready, or the next request comes in. Lines of other
        threads do not belong to it.
        """
        log = self._handset.log
        entry = log.wait(re.compile(rf"^{handler}\(\)$"), after=self._from)
        end = log.wait(HANDLER_ENDS, after=entry.end)
        self._from = end.end
        thread = (entry.pid, entry.tid)
        return [entry.text, *(record.text for record in log.records(entry.end)
                              if (record.pid, record.tid) == thread and record.end < end.end)]

    def expect_handler(self, handler: str, *wanted: Wanted) -> None:
        """Behind its entry line, HANDLER has logged exactly the texts WANTED."""
        lines = "\n".join(self.lines(handler)[1:])
        expression = "\n".join(re.escape(text) if isinstance(text, str) else text.pattern
                               for text in wanted)
        assert re.fullmatch(expression, lines), "\n".join(
            [f"{handler} has logged:", lines, "instead of:", *map(str, wanted)])
