"""The demo's table: whatever is exchanged, its lines fit a terminal of 100 columns."""

import pytest

from tools.demo.stage import Stage

LONG = "version=" + "(HW8G-0031 7456 MiB rev 5)" * 6 + "x" * 200


@pytest.mark.parametrize("sent", ["-> AT", "-> 187 AMT_WIFI_RTX_TEST_CMD step=03, " + LONG, ""])
@pytest.mark.parametrize("received", [[], ["<- OK"], [f"<- {LONG}", "<- OK"]])
def test_no_line_is_longer(sent: str, received: list[str],
                           capsys: pytest.CaptureFixture[str]) -> None:
    Stage().row(1234.5, "a name of 26 letters, as be", sent, received, True)
    lines = capsys.readouterr().out.splitlines()
    assert max(map(len, lines)) <= 100
    assert "".join("".join(lines).split()) == "".join(
        "".join(["1234.5 ms  ok  a name of 26 letters, as be", sent,
                 *(received or ["(nothing)"])]).split())


def test_a_short_exchange_is_one_line(capsys: pytest.CaptureFixture[str]) -> None:
    stage = Stage()
    stage.row(0.5, "probe", "-> AT", ["<- OK"], True)
    stage.row(None, "refused", "-> AT", ["<- ERROR"], False)
    said = [line.split() for line in capsys.readouterr().out.splitlines()]
    assert said == [["0.5", "ms", "ok", "probe", "->", "AT", "<-", "OK"],
                    ["FAILED", "refused", "->", "AT", "<-", "ERROR"]]
    assert (stage.passed, stage.failures) == (1, ["refused"])
