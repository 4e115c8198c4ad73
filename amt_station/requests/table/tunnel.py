"""Requests that the handset does not understand itself: it carries them to the modem and back.

Their atoms are the modem's business, so the rows say only what the way there and back fixes: the
fields of the answer.
"""

from __future__ import annotations

from typing import Mapping

from amt_station.requests.catalogue import command_name
from amt_station.requests.model import RESULT, Field, Refusal, Request
from amt_station.requests.table.common import BOOL, BYTES, INT, asks_modem


_SERVICE = asks_modem(
    "the atoms' values are sent in order in one AT^DTTEST block, and the block of the modem's "
    "answer becomes the answer packet; OK without a block leaves the request unanswered",
    Refusal("an atom is malformed, or the block is longer than 2041 bytes"),
    Refusal("the modem answers ERROR, +CME ERROR or +CMS ERROR, its line fails, or its block "
            "cannot be converted"))

_IDS = (1, 3, *range(11, 28, 2), 39, 41, 42, 43, 47, 49, 51, 53, 59, 61, 63, *range(67, 84, 2),
        93, 95, 97, 101, 103, *range(105, 136, 2), 149, 151, 153, 155, 201, 204, 205, 207, 209,
        211, 213, 221)

_TABLE_DATA = (RESULT, Field(4, BYTES, "data", "content of the table"))
_DSP_DATA = (RESULT, Field(62, BYTES, "data", "data of the DSP"))
_ANSWER_FIELDS: Mapping[int, tuple[Field, ...]] = {
    23: (RESULT, Field(12, INT, "rx-value", "number in front of the received data"),
         Field(4, BYTES, "data", "received data")),
    25: (RESULT, Field(13, INT, "iq-power", "IQ power")),
    47: _TABLE_DATA,
    61: _TABLE_DATA,
    113: _TABLE_DATA,
    59: (RESULT, Field(24, INT, "adc", "RF ADC value")),
    77: (RESULT, Field(34, BYTES, "serial", "IQ serial data")),
    105: (RESULT, Field(43, BYTES, "data", "transparent data")),
    109: (RESULT, Field(44, BOOL, "flag", "flag of the table")),
    151: _DSP_DATA,
    221: _DSP_DATA,
}
_ANSWER_IDS: Mapping[int, int] = {221: 221}
_NOTES: Mapping[int, tuple[str, ...]] = {
    42: ("A response id that is served as a request too.",),
    151: ("In the block, each value is preceded by its length (16 bits, little-endian).",),
    204: ("Named as response data in the catalogue, served as a request.",),
    221: ("Named as an indication in the catalogue, served as a request; the modem's block "
          "decides the id of the answer.",),
}


def _row(command: int) -> Request:
    name = command_name(command)
    plain = name.removeprefix("AMT_").removesuffix("_CMD").lower().replace("_", "-")
    return Request(command, plain, name, app=_SERVICE, answer=_ANSWER_IDS.get(command),
                   answer_fields=_ANSWER_FIELDS.get(command, (RESULT,)),
                   notes=_NOTES.get(command, ()))


REQUESTS: tuple[Request, ...] = tuple(_row(command) for command in _IDS)
