"""Tests of the handset's own devices."""

from __future__ import annotations

from amt_station.requests.model import RESULT, Channel, Field, Operation, Refusal, Request
from amt_station.requests.table.common import DEVICE_FILE, INT, ON, STRING, TEST_HAL, on_app, on_pc


_PC, _APP = (Channel.PC,), (Channel.APP,)
_CAMERA = Refusal("the camera cannot be opened or refuses")
_CALIBRATION = ("a", "b", "c", "d")
_CONTROLS = {"main": 1, "second": 2}

REQUESTS: tuple[Request, ...] = (
    Request(
        224, "battery-adc", "raw battery ADC value",
        answer_fields=(Field(151, INT, "adc", "ADC value; 0 when the battery driver cannot be "
                             "asked", unit="raw ADC steps"), RESULT),
        pc=on_pc("asks the battery driver", DEVICE_FILE),
        operations=(Operation(("battery", "adc"), "read the battery ADC", channels=_PC,
                              brings=("adc",)),)),
    Request(
        226, "battery-calibrate", "battery ADC calibration",
        fields=tuple(Field(146 + number, INT, name, f"calibration value {number + 1}", absent="0")
                     for number, name in enumerate(_CALIBRATION)),
        pc=on_pc("writes /amt/vbatt and hands the values to the battery driver",
                 Refusal("/amt/vbatt cannot be written")),
        operations=(Operation(("battery", "calibrate"), "store the battery ADC calibration",
                              takes=_CALIBRATION, channels=_PC),)),
    Request(
        29, "lcd-show", "LCD test; the picture is the test app's business",
        app=on_app("answers only"),
        operations=(Operation(("lcd", "show"), "LCD test (answered only)", channels=_APP),)),
    Request(
        57, "lcd-brightness", "LCD backlight level",
        fields=(Field(26, INT, "level", "0 to 255; any other restores the level found before the "
                      "first request", absent="0", low=-1, high=255, positional=True),),
        app=on_app("writes /sys/class/leds/lcd-backlight/brightness. There is no error packet: a "
                   "level that cannot be written is not answered at all"),
        notes=("A restore without a level found writes 200.",),
        operations=(
            Operation(("lcd-brightness", "set"), "set the LCD backlight", takes=("level",),
                      channels=_APP),
            Operation(("lcd-brightness", "restore"), "restore the LCD backlight", {"level": -1},
                      channels=_APP))),
    Request(
        37, "button-backlight", "button backlight", fields=(ON,),
        app=on_app("writes /sys/class/leds/button-backlight/brightness", DEVICE_FILE),
        operations=(
            Operation(("button-backlight", "on"), "light the buttons", {"on": 1}, channels=_APP),
            Operation(("button-backlight", "off"), "darken the buttons", {"on": 0},
                      channels=_APP))),
    Request(
        35, "vibrator", "vibrator, 3 s a run", fields=(ON,),
        app=on_app("writes /sys/class/timed_output/vibrator/enable", DEVICE_FILE),
        operations=(
            Operation(("vibrator", "on"), "run the vibrator for 3 s", {"on": 1}, channels=_APP),
            Operation(("vibrator", "off"), "stop the vibrator", {"on": 0}, channels=_APP))),
    Request(
        137, "tf-card", "capacity of the memory card",
        answer_fields=(Field(55, INT, "capacity", "capacity, 0 without a card", unit="KB"),
                       RESULT),
        app=on_app("reads the size of the mounted card"),
        operations=(Operation(("tf-card",), "read the memory card's capacity",
                              channels=_APP, brings=("capacity",)),)),
    Request(
        33, "audio", "play the configured sound", fields=(ON,),
        app=on_app("starts or ends the player program",
                   Refusal("on: the player or the sound file is missing, or the player fails")),
        operations=(
            Operation(("audio", "play"), "play the test sound", {"on": 1}, channels=_APP),
            Operation(("audio", "stop"), "end the test sound", {"on": 0}, channels=_APP))),
    Request(
        31, "audio-loop", "loop the microphone to an output",
        fields=(ON, Field(30, INT, "type", "loop type, the audio library's", absent="0")),
        app=on_app("calls the audio library",
                   Refusal("the audio library or its entry is missing")),
        operations=(
            Operation(("audio", "loop", "on"), "close an audio loop", {"on": 1}, may_take=("type",),
                      channels=_APP),
            Operation(("audio", "loop", "off"), "open an audio loop", {"on": 0}, may_take=("type",),
                      channels=_APP))),
    Request(
        139, "camera-preview", "select the main camera's preview",
        app=on_app("asks the camera driver", _CAMERA),
        operations=(Operation(("camera", "preview", "main"), "preview of the main camera",
                              channels=_APP),)),
    Request(
        147, "camera-preview-second", "select the second camera's preview",
        app=on_app("asks the camera driver", _CAMERA),
        operations=(Operation(("camera", "preview", "second"), "preview of the second camera",
                              channels=_APP),)),
    Request(
        180, "camera-control", "camera self-test",
        fields=(Field(112, INT, "camera", "1 main, 2 second camera", choices=_CONTROLS, low=1,
                      high=2, absent="0 (refused)"),),
        answer_fields=(Field(113, INT, "outcome", "the camera driver's result; 3 when the "
                             "selected input is not there"), RESULT),
        app=on_app("asks the camera driver", Refusal("the camera is neither 1 nor 2"), _CAMERA),
        operations=(Operation(("camera", "test"), "camera self-test", takes=("camera",),
                              channels=_APP, brings=("outcome",)),)),
    Request(
        238, "dev-info", "device information text",
        answer_fields=(Field(200, STRING, "information", "at most 4055 characters"), RESULT),
        app=on_app("calls the platform's test library", TEST_HAL),
        operations=(Operation(("dev-info",), "read the device information", channels=_APP,
                              brings=("information",)),)),
    Request(
        246, "emmc-info", "eMMC information",
        answer_fields=(Field(205, STRING, "information", "first line of "
                             "/sys/devinfo/emmc_info, at most 48 characters"), RESULT),
        pc=on_pc("reads the file", Refusal("the file cannot be opened or is empty")),
        at_twin="AT^DEMMCINFO?",
        operations=(Operation(("emmc-info",), "read the eMMC information", channels=_PC,
                              brings=("information",)),)),
)
