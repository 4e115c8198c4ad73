"""The house as data: what stands on what. `./dev lint` holds it; docs/architecture.md explains it.

A floor is a row of rooms. What lies in a room includes, or imports, from its own room and its own
floor and from the floors above it in these tables, which are below it in the house: never up. Two
rooms of one floor do not include each other. A path belongs to the longest name that fits.
"""

Floors = tuple[tuple[str, ...], ...]

CPP_FLOORS: Floors = (
    ("platform/include",),
    ("pub/error.h",),
    ("pub/log", "pub/pub-log.h"),
    ("pub/file",),
    ("pub/util", "pub/cfg"),
    ("pub/pty",),
    ("amt/amt-buf.h", "amt/amt-byte-order.h", "amt/amt-log.h", "amt/amt-atom", "amt/amt-command",
     "amt/amt-checksum", "amt/amt-packet", "amt/amt-convert"),
    ("amt/amt-cfg",),
    ("amt/amt-handle/channel",),
    ("amt/amt-handle/request",),
    ("amt/amt-device",),
    ("amt/amt-gps",),
    ("amt/amt-handle/at",),
    ("amt/amt-handle/handshake",),
    ("amt/amt-handle/reader",),
    ("amt/amt-handle",),
    ("amt/signal-treatment",),
    ("amt/main.cpp", "amt/signal-treatment"),
    # What the daemon never includes.
    ("platform/host", "cmake"),
    ("tests",),
)

PYTHON_FLOORS: Floors = (
    ("amt_station/wire",),
    ("amt_station/errors",),
    ("amt_station/requests",),
    ("amt_station",),
    ("amt_station/cli", "amt_simulator/inside"),
    ("amt_simulator",),
    ("amt_line/plan", "amt_line/statistics"),
    ("amt_line/run",),
    ("amt_line/store", "amt_line/drawing"),
    ("amt_line/report", "amt_line/view"),
    ("amt_line", "amt_line/cli"),
    # A handset for other people's tests, simulated when none is named.
    ("amt_station/pytest_plugin",),
    # What starts everything.
    ("amt_station/__main__", "tools", "amt", "platform", "packaging"),
    ("tests",),
)

# Headers of fewer lines than HEADER_LINES, each with its reason.
HEADER_LINES = 13
SHORT_HEADERS: dict[str, str] = {
    "pub/log/print.h": "progress on standard output is one operation, and no log record",
    "pub/util/util.h": "only gathers the headers of its room",
    "pub/pub-log.h": "the library's log sources, apart from the kit that logs",
    "amt/amt-log.h": "the daemon's log sources, apart from the kit that logs",
}

# No source is longer, but for those with a reason.
FILE_LINES = 500
LONG_FILES: dict[str, str] = {}
