"""Verdicts of the test stations, in the modem and in the handset's two result files."""

from __future__ import annotations

from amt_station.requests.model import RESULT, Channel, Field, Operation, Refusal, Request, Service
from amt_station.requests.table.common import INT, MODEM_ERROR, STRING, VERDICTS, asks_modem, on_app


_VERDICT = Field(36, INT, "verdict", "1 pass, 2 fail, anything else unknown", choices=VERDICTS,
                 low=0, high=2, flags=True, absent="0 (unknown)")
_STATION_OUT = Field(39, INT, "station", "station number", echo=True)
_DESCRIPTION_OUT = Field(37, STRING, "description", "test description, at most 127 characters")

REQUESTS: tuple[Request, ...] = (
    Request(
        91, "test-result-write", "store a station's verdict",
        fields=(Field(39, INT, "station", "station number; 0 to 19 are mirrored in "
                      "/amt/amt_result.txt", low=0, absent="0"),
                _VERDICT,
                Field(37, STRING, "description", "test description, at most 126 characters; app "
                      "channel only", longest=126, absent="none", format="description")),
        pc=Service("modem", False, "writes the verdict to /amt/amt_result.txt, whatever comes of "
                   "it, then passes the request on to the modem unchanged; the modem answers"),
        app=asks_modem("writes the verdict to /amt/amt_result.txt, whatever comes of it, and to "
                       "the modem (AT^DATOMW)", MODEM_ERROR),
        operations=(Operation(("test-result", "write"), "store a station's verdict",
                              takes=("station", "verdict"), may_take=("description",)),)),
    Request(
        89, "test-result-read", "read a station's verdict from the modem",
        fields=(Field(39, INT, "station", "station number", low=0, high=99, absent="0"),),
        answer_fields=(_STATION_OUT, _VERDICT, _DESCRIPTION_OUT, RESULT),
        app=asks_modem("asks the modem (AT^DATOMR) and writes the verdict to "
                       "/amt/amt_result.txt", MODEM_ERROR),
        notes=("Only two digits of the station number in the modem's answer are read; a modem "
               "that answers OK alone leaves the number asked for.",),
        operations=(Operation(("test-result", "read"), "read a station's verdict",
                              takes=("station",), brings=("station", "verdict")),)),
    Request(
        228, "item-result-read", "read an item of /amt/product.txt",
        fields=(Field(39, INT, "station", "item index, counted from 0", low=0, high=35,
                      absent="0"),),
        answer_fields=(_STATION_OUT, _VERDICT, RESULT),
        app=on_app("reads the item; a missing file is made first, with every item unknown",
                   Refusal("the index is above 35 or the file cannot be read", 10)),
        notes=("Reading counts items from 0, writing from 1: what was written as station 1 is "
               "read as station 0.",),
        operations=(Operation(("item-result", "read"), "read an item (counted from 0)",
                              takes=("station",), channels=(Channel.APP,),
                              brings=("station", "verdict")),)),
    Request(
        230, "item-result-write", "store an item in /amt/product.txt",
        fields=(Field(39, INT, "station", "item number, counted from 1", low=1, high=36,
                      absent="0 (writes the first item)"), _VERDICT),
        app=on_app("writes the item; a missing file is made first, with every item unknown",
                   Refusal("the number is above 36 or the file cannot be written", 10)),
        notes=("Writing counts items from 1, reading from 0.",),
        operations=(Operation(("item-result", "write"), "store an item (counted from 1)",
                              takes=("station", "verdict"), channels=(Channel.APP,)),)),
)
