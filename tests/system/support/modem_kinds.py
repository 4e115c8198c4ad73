"""One request of each kind that waits for the modem's final result, and what becomes of it."""

from dataclasses import dataclass

from amt_station import wire
from support.channels import flag, integer, packet, raw, string
from support.modem_desk import ERROR, ERRORS, MODEM_FAILED, NOT_SERVED, OK, refusal

# These words are enough for an error result, wherever its line ends.
ERROR_MARKS = (ERROR, b"\r\n+CME ERROR", b"\r\n+CMS ERROR")


@dataclass(frozen=True)
class Kind:
    """A request, the command it becomes, the modem's answer before its final result, the reply.

    `code` is what a failure is answered with: 10 by the handler, 1 by the dispatcher when the
    handler leaves it alone. `without` is the reply to a final OK with nothing before it.
    """

    name: str
    function: str
    request: wire.Packet
    command: bytes
    answer: bytes
    reply: wire.Packet
    code: int
    without: tuple[wire.Packet, ...]
    ok: bytes = OK

    @property
    def whole(self) -> bytes:
        """The answer with its final result."""
        return self.answer + OK

    @property
    def refusal(self) -> wire.Packet:
        """The one packet that tells of a failure."""
        return refusal(self.request.command, self.code)

    def decided(self, said: bytes) -> bool:
        """Whether the exchange ends with what the modem has SAID."""
        return any(mark in said for mark in (self.ok, *ERROR_MARKS))


def _failed(command: int) -> tuple[wire.Packet, ...]:
    return (refusal(command, MODEM_FAILED),)


# Station numbers from 20 on keep the mirror file out of it.
_READ = packet(90, integer(39, 31), integer(36, 1), string(37, "all good"), integer(1, 0))
_READ_NOTHING = packet(90, integer(39, 30), integer(36, 0), string(37, ""), integer(1, 0))
_WRITTEN = packet(92, integer(1, 0))

KINDS = {kind.name: kind for kind in (
    Kind("tunnel", "amt_modem_handle_req", packet(0x19, integer(5, 0x11223344), flag(6, 1)),
         b"AT^DTTEST=194433221101\r", b"\r\n^DTTEST: 1A000000000000002A\r\n",
         packet(0x1A, integer(1, 0), integer(13, 42)), NOT_SERVED, (), b"OK"),
    Kind("version", "handle_amt_req_l1_hls_version", packet(45, integer(19, 17)),
         b"AT^DCMR=17\r", b"\r\n^DCMR: 1,0D4142430A\r\n",
         packet(46, integer(19, 17), raw(18, b"ABC"), integer(1, 0)), NOT_SERVED,
         (refusal(45, NOT_SERVED),)),
    Kind("write-result", "amt_modem_write_test_result",
         packet(91, integer(39, 25), integer(36, 2), string(37, "antenna")),
         b"AT^DATOMW=25,2,antenna\r", b"", _WRITTEN, MODEM_FAILED, (_WRITTEN,)),
    Kind("read-result", "amt_modem_read_test_result", packet(89, integer(39, 30)),
         b"AT^DATOMR=1,30\r", b"\r\n^DATOMR: 31,1,all good\r\n", _READ, MODEM_FAILED,
         (_READ_NOTHING,)),
    Kind("support", "amt_query_amt_support", packet(197), b"AT^DMCC?\r",
         b"\r\n^DMCC: 2,1,4,7\r\n", packet(198, integer(202, 7), integer(1, 0)), MODEM_FAILED,
         _failed(197)),
    Kind("serial", "amt_read_serial_number", packet(234), b"AT^DMSN\r",
         b"\r\n^DMSN: S0123456789\r\n", packet(235, raw(163, b"S0123456789"), integer(1, 0)),
         MODEM_FAILED, _failed(234)),
    Kind("sim", "amt_dtoc_checkSIM", packet(99), b"AT^DTOC\r", b"\r\n^DTOC: 2\r\n",
         packet(100, flag(41, 1)), MODEM_FAILED, _failed(99)),
    Kind("board", "amt_modem_handle_read_board", packet(85), b"AT^DMSN\r",
         b"\r\n^DMSN: B-42\r\n", packet(86, string(38, "B-42"), integer(1, 0)), MODEM_FAILED,
         _failed(85)),
    Kind("out-date", "amt_modem_handle_read_outdate", packet(65), b"AT^DMFD??\r",
         b"\r\n^DMFD: 20130121\r\n", packet(66, string(27, "20130121"), integer(1, 0)),
         MODEM_FAILED, _failed(65)),
)}

__all__ = ["ERRORS", "KINDS", "Kind"]
