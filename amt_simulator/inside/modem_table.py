"""The modem's answers: one row a command, then one row a tunnelled or packet request.

Texts are formatted with the modem's memory: `{imei}` and `{sn}` belong to the channel that is
selected, everything else to the modem as a whole.
"""

from typing import NamedTuple

# What the modem can be told: to answer, to answer late or with a refusal, to hear only, to leave
# its ttys to others, to be away.
MODES = ("table", "slow", "refusing", "silent", "held", "absent")
SLOW_SECONDS = 2.0
# What a refusing modem says, by text and by packet.
REFUSAL = "\r\nERROR\r\n"
REFUSAL_CODE = 10

# What the modem holds when it comes up.
MEMORY = {
    "maker": "Handset Works",
    "model": "KEL-1",
    "revision": "KEL-1 modem 3.20",
    "reports": "0",
    "channel": "0",
    "mode": "0",
    "factory_date": "20130121",
    # sim_num, standby_num, rf_set_num, standby0_rat
    "capability": "2,2,1,3",
    # 1 and 2 are kinds of SIM, 0 is none
    "sim": "1",
    "pin": "READY",
}

# What each modem channel holds when it comes up.
IDENTITIES = {
    "0": {"imei": "860000000000017", "sn": "KEL0000000000001"},
    "1": {"imei": "860000000000025", "sn": "KEL0000000000002"},
}
DEFAULT_IDENTITY = {"imei": "860000000000009", "sn": "KEL0000000000000"}

# Module versions as ^DCMR gives them: a carriage return, the text, line feeds, all in hexadecimal.
MODULE_VERSIONS = {"17": "KEL-1 L1 1.17.0", "18": "KEL-1 HLS 2.18.0"}


class Row(NamedTuple):
    """One command of the modem.

    The command is matched without regard to case; one that ends in "=" takes what follows.
    INFO is the information line, STORE the name under which the parameter is kept.
    SPECIAL names a method of the modem for the few commands that are more than that.
    """

    command: str
    info: str = ""
    store: str = ""
    special: str = ""


COMMANDS = (
    # basics
    Row(""),
    Row("E0"),
    Row("E1"),
    Row("Z"),
    Row("&F"),
    Row("I", info="{maker} {model}"),
    Row("+CGMI", info="{maker}"),
    Row("+CGMM", info="{model}"),
    Row("+CGMR", info="{revision}"),
    Row("+CGSN", info="{imei}"),
    Row("+CMEE="),
    Row("+CFUN="),
    Row("+CFUN?", info="+CFUN: 1"),
    Row("+CPIN?", info="+CPIN: {pin}"),
    Row("+CSQ", info="+CSQ: 24,99"),
    # link reports
    Row("^DLKS=", store="reports"),
    Row("^DLKS?", info="^DLKS: {reports}"),
    # channel and identity
    Row("^DMPCHN=", store="channel"),
    Row("^DMPCHN?", info="^DMPCHN: {channel}"),
    Row("^DCGSNW=", store="imei"),
    Row("^DMSN=", store="sn"),
    Row("^DMSN", info="^DMSN: {sn}"),
    # factory data
    Row("^DMFD??", info="^DMFD: {factory_date}"),
    Row("^DMFD=", store="factory_date"),
    Row("^DATOMW=", special="write_result"),
    Row("^DATOMR=", special="read_result"),
    # modes, capability, SIM, versions
    Row("^DMCC?", info="^DMCC: {capability}"),
    Row("^DSWAMT=", store="mode"),
    Row("^DTOC", special="sim_type"),
    Row("^DCMR=", special="module_version"),
    # the tunnel
    Row("^DTTEST=", special="tunnel"),
)


class Int(NamedTuple):
    """A 32-bit number of a response, under an atom id."""

    atom: int
    value: int


class Flag(NamedTuple):
    """A one-byte value of a response."""

    atom: int
    value: int


class Blob(NamedTuple):
    """Bytes of a response; LENGTH_SIZE bytes (0, 2 or 4) of length stand before them in a block."""

    atom: int
    value: bytes
    length_size: int = 4


class Text(NamedTuple):
    """A text of a response packet, formatted with the modem's memory."""

    atom: int
    value: str


Field = Int | Flag | Blob | Text

# What follows the result in the answer to a request, by response id. Any other response holds the
# result alone. An IMEI of {imei} is filled in from the memory.
RESPONSES: dict[int, tuple[Field, ...]] = {
    0x08: (Blob(21, b"{imei}", 0),),
    0x18: (Int(12, 64), Blob(4, bytes(range(64)))),
    0x1A: (Int(13, -47),),
    0x2E: (Int(19, 17), Blob(18, b"KEL-1 L1 1.17.0".ljust(64, b"\n"), 0)),
    0x30: (Blob(4, bytes(range(32))),),
    0x3C: (Int(24, 512),),
    0x3E: (Blob(4, bytes(range(32, 64))),),
    0x4E: (Blob(34, b"IQ-0001"),),
    0x64: (Flag(41, 1),),
    0x6A: (Blob(43, b"\x01\x02\x03\x04"),),
    0x6E: (Flag(44, 1),),
    0x72: (Blob(4, bytes(range(64, 96))),),
    0x98: (Blob(62, b"\x05\x06\x07\x08", 2),),
    0xDD: (Blob(62, b"\x09\x0a", 2),),
}

# Requests that are not answered with the next id.
RESPONSE_IDS = {0xDD: 0xDD}

# What follows the result when the request came as a packet, by request id; special answers are
# named after a method of the modem. Any other request is answered as in the tunnel.
PACKETS: dict[int, tuple[Field, ...] | str] = {
    45: "packet_version",
    65: (Text(27, "{factory_date}"),),
    85: (Text(38, "{sn}"),),
    89: "packet_result",
    197: "packet_capability",
    228: "packet_result",
    234: "packet_serial_number",
}

# Values that a packet writes: under which atom of which request, and into what of the memory.
WRITES = {5: (21, "imei"), 87: (38, "sn")}
CHANNEL_SWITCH, CHANNEL_ATOM = 232, 159
