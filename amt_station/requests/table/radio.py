"""Bluetooth, Wi-Fi and GPS tests through the platform's test library."""

from __future__ import annotations

from amt_station.requests.model import RESULT, Field, Operation, Refusal, Request
from amt_station.requests.table.common import BYTES, INT, TEST_LIBRARY, on_app, on_pc


_WIFI_STEPS = {"start": 1, "stop": 2, "tx-start": 3, "tx-stop": 4, "rx-start": 5, "rx-stop": 6}
_WIFI_HOW = "runs the step in the test library; a repeated start or stop does nothing"
_WIFI_REFUSALS = (
    Refusal("the step is not 1 to 6"),
    Refusal("a transmit or receive step before start"),
    Refusal("a start of transmission or reception without one of its values"),
    TEST_LIBRARY)
_WIFI_ON = ("wifi", "start")

_BT_HOW = ("answers twice: at once when the switch-on was started, and again, from the process "
           "that did it, when it is done")
_BT_REFUSALS = (
    Refusal("the process for the switch-on cannot be started; there is one answer only"),
    Refusal("the switch-on fails: the second answer carries the code, and nothing is held, "
            "because the first one has completed the request", held=False))

_GPS_HOW = "asks the test library"
_ANSWER_ONLY = "answers only, without touching the hardware"


REQUESTS: tuple[Request, ...] = (
    Request(
        170, "bluetooth", "switch the Bluetooth chip on for testing",
        pc=on_pc(_BT_HOW, *_BT_REFUSALS), app=on_app(_BT_HOW, *_BT_REFUSALS),
        answers=2, timeout=60.0, at_twin="AT^DBTCTRL=1",
        operations=(Operation(("bluetooth", "start"), "switch the Bluetooth chip on and wait "
                              "until it is"),)),
    Request(
        187, "wifi", "Wi-Fi radio test",
        fields=(Field(154, BYTES, "step", "what to do; the first byte of the atom counts, "
                      "whatever its type", choices=_WIFI_STEPS, width=1, absent="0 (refused)"),
                Field(155, BYTES, "channel", "Wi-Fi channel", width=1, low=1, high=196,
                      absent="refused where it is needed"),
                Field(156, BYTES, "rate", "rate, in hundredths of Mbit/s or as "
                      "the test library takes it", width=2, low=1, high=5400,
                      unit="the test library's", absent="refused where it is needed"),
                Field(157, BYTES, "power", "transmit power", width=2, low=0, high=127,
                      unit="the test library's", absent="refused where it is needed")),
        answer_fields=(Field(154, BYTES, "step", "the step asked for", choices=_WIFI_STEPS,
                             width=1, echo=True),
                       Field(158, INT, "packets", "packets received, only in the answer to the "
                             "end of reception"), RESULT),
        pc=on_pc(_WIFI_HOW, *_WIFI_REFUSALS), app=on_app(_WIFI_HOW, *_WIFI_REFUSALS),
        timeout=30.0, at_twin="AT^DWLTSD=",
        notes=("Transmission needs channel, rate and power; reception channel and rate. "
               "Numbers in bytes atoms are little-endian.",
               "Reception is stopped on the channel it was started on.",
               "The station sends the start step before every transmit or receive step, because "
               "one without it would be refused; a second start does nothing."),
        operations=(
            Operation(("wifi", "start"), "put the Wi-Fi chip into test mode", {"step": 1}),
            Operation(("wifi", "stop"), "take the Wi-Fi chip out of test mode", {"step": 2}),
            Operation(("wifi", "tx", "start"), "start transmission", {"step": 3},
                      ("channel", "rate", "power"), before=_WIFI_ON),
            Operation(("wifi", "tx", "stop"), "stop transmission", {"step": 4},
                      before=_WIFI_ON),
            Operation(("wifi", "rx", "start"), "start reception", {"step": 5},
                      ("channel", "rate"), before=_WIFI_ON),
            Operation(("wifi", "rx", "stop"), "stop reception and read the packets received",
                      {"step": 6}, before=_WIFI_ON, brings=("packets",)))),
    Request(
        174, "gps-control", "GPS start, stop and connectivity check",
        fields=(Field(140, INT, "operation", "0 stop, 1 start, 2 connectivity check; any other "
                      "starts", choices={"stop": 0, "start": 1, "check": 2},
                      absent="0 (stop)"),),
        pc=on_pc(_GPS_HOW, TEST_LIBRARY), app=on_app(_GPS_HOW, TEST_LIBRARY),
        timeout=30.0, at_twin="AT^DGPSCTRL=",
        operations=(Operation(("gps", "start"), "start the GPS", {"operation": 1}),
                    Operation(("gps", "stop"), "stop the GPS", {"operation": 0}),
                    Operation(("gps", "check"), "check the GPS chip", {"operation": 2}))),
    Request(
        176, "gps-test", "GPS test, only acknowledged",
        pc=on_pc(_ANSWER_ONLY), app=on_app(_ANSWER_ONLY), answer=175,
        notes=("Answered with 175, the answer id of GPS control; 177 comes only as an error "
               "packet.",),
        operations=(Operation(("gps", "test"), "GPS test (answered only)"),)),
    Request(
        178, "gps-read", "signal of one satellite",
        fields=(Field(141, INT, "index", "satellite index", low=0, absent="0"),),
        answer_fields=(Field(144, INT, "cnr", "carrier-to-noise value",
                             unit="the test library's, usually dB-Hz"),
                       Field(141, INT, "satellite", "satellite id"), RESULT),
        pc=on_pc(_GPS_HOW, TEST_LIBRARY), app=on_app(_GPS_HOW, TEST_LIBRARY),
        timeout=30.0,
        operations=(Operation(("gps", "read"), "read the signal of a satellite",
                              takes=("index",), brings=("satellite", "cnr")),)),
)
