"""The page of the line in a real browser."""

from __future__ import annotations

from pathlib import Path
from typing import Any, Iterator

import pytest
from line_browser import DESKTOP, TABLET, UPRIGHT, Browser, Keys, browser, started_browser
from line_page import ToldLine
from PIL import Image

__all__ = ["browser", "started_browser"]

# One worker has the browser: four of them would keep the machine busy with starting.
pytestmark = pytest.mark.xdist_group("browser")

HOSTILE = "<script>window.hacked=1</script><img src=x onerror=window.hacked=2>\u202eevil"
SHOWN = HOSTILE.replace("\u202e", "\\u202e")
VALUE = {"name": "adc", "value": 4050, "unit": "mV", "limits": {"min": 100, "max": 4000},
         "verdict": "fail", "reason": "adc is 4050 mV, more than 4000 mV"}


@pytest.fixture
def line() -> Iterator[ToldLine]:
    """A line that is only told, with its page."""
    told = ToldLine()
    yield told
    told.close()


@pytest.fixture
def picture(tmp_path: Path) -> Path:
    """A picture of a white screen."""
    path = tmp_path / "white.png"
    Image.new("RGB", (320, 200), "#fff").save(path)
    return path


def failed(line: ToldLine, slot: str, run: str) -> None:
    """The first step fails, and the run with it."""
    line.step_ended(slot, run, 1, "fail", values=[VALUE], reason=VALUE["reason"])
    line.ended(slot, run, "FAIL", reason=f"battery ADC: {VALUE['reason']}",
               advice="see to the battery")


def seen(browser: Browser) -> dict[str, Any]:
    """All that the page shows but for the time that goes by."""
    shown: dict[str, Any] = browser.script(
        "const at = (selector) => [...document.querySelectorAll(selector)];"
        "return {tiles: at('.tile').map((tile) => [tile.dataset.look, tile.className,"
        " at(`[data-slot=\"${tile.dataset.slot}\"] :is(.slot,.dut,.word,.what,.state)`)"
        ".map((part) => part.textContent)]),"
        " steps: at('.segments').map((bar) => [...bar.children].map((step) => step.className)),"
        " counts: at('[data-count]').map((count) => count.textContent),"
        " desk: at('#who-slot, #question, #others-list').map((part) => part.textContent)}")
    return shown


def test_a_run_is_watched_from_begin_to_verdict(browser: Browser, line: ToldLine) -> None:
    line.slot("A")
    line.slot("B")
    browser.open(line.page.url)
    browser.wait_look("A", "waiting")
    run = line.began("A")
    line.step("A", run, 1)
    browser.wait_look("A", "running")
    browser.wait_text('[data-slot="A"] .what', "battery ADC")
    assert (browser.tile("A", ".word"), browser.tile("A", ".dut")) == ("1/4", "KEL0000000042")
    line.step_ended("A", run, 1)
    line.step("A", run, 2, "version")
    browser.wait_text('[data-slot="A"] .word', "2/4")
    steps = browser.all('[data-slot="A"] .segments span')
    assert [step.get_attribute("class") for step in steps] == ["pass", "now", "", ""]
    failed(line, "A", run)
    browser.wait_look("A", "fail")
    assert browser.tile("A", ".word") == "FAIL"
    assert browser.tile("A", ".what") == "battery ADC: adc is 4050 mV, more than 4000 mV"
    assert browser.one('[data-slot="A"] .limit-bar').get_attribute("aria-label") == VALUE["reason"]
    assert browser.tile("A", ".limit-bar") == "1004000"
    browser.wait_text("#news", "Slot A: FAIL")
    assert browser.text('[data-count="FAIL"]') == "1"
    line.slot("A")
    line.slot("B", "held", "/dev/ttyB is held by terminal (4711)")
    browser.wait_look("B", "held")
    assert browser.tile("A", ".word") == "FAIL", "the verdict stays until the next handset"
    assert "terminal (4711)" in browser.tile("B", ".what")
    browser.picture("line-run")
    run = line.began("A", "KEL0000000043")
    browser.wait_look("A", "running")
    line.ended("A", run, "PASS", "KEL0000000043")
    browser.wait_look("A", "pass")
    assert browser.tile("A", ".dut") == "KEL0000000043"


def test_a_question_is_answered_by_button_and_by_key(browser: Browser, line: ToldLine,
                                                     picture: Path) -> None:
    line.slot("A")
    run = line.began("A")
    browser.open(line.page.url)
    asked = line.ask("A", "Is the screen white?", run=run, picture=picture)
    browser.ready()
    assert (browser.text("#who-slot"), browser.text("#question")) == (
        "Slot A", "Is the screen white?")
    browser.wait(lambda: browser.script("return document.getElementById('picture').naturalWidth"),
                 "the picture")
    browser.picture("line-question")
    browser.one("#yes").click()
    assert (asked.text(), asked.by()) == ("yes", "page")
    browser.wait_text("#question", "Nothing is being asked.")
    assert browser.focused() == "field"
    asked = line.ask("A", "Is there a dark spot?", run=run)
    browser.ready()
    browser.type("n")
    assert asked.text() == "no"
    asked = line.ask("A", "Is it on?", run=run)
    browser.ready()
    browser.type("Yes", Keys.ENTER)
    assert asked.text() == "yes"


def test_a_scanned_code_never_answers_yes_or_no(browser: Browser, line: ToldLine) -> None:
    line.slot("A")
    run = line.began("A")
    asked = line.ask("A", "Is the screen white?", run=run)
    browser.open(line.page.url)
    browser.ready()
    browser.type("y123n", Keys.ENTER)
    browser.wait_text("#message", "“y123n” is neither yes nor no.")
    browser.type("ny")
    # Two keys at once are a code; what would have answered is over by the next event.
    browser.script("setTimeout(() => { document.body.dataset.waited = 'yes'; }, 600)")
    browser.wait(lambda: browser.all('body[data-waited="yes"]'), "time for a wrong answer")
    assert asked.answer is None
    browser.type(Keys.ESCAPE)
    browser.one("#question").click()
    browser.type("y")
    assert asked.text() == "yes"


def test_inputs_are_answered_the_oldest_first_and_by_their_slot(browser: Browser,
                                                                line: ToldLine) -> None:
    for slot in ("A", "B", "C"):
        line.slot(slot, "asking")

    def fits(text: str) -> None:
        if not text.startswith("KEL"):
            from amt_line.run.desk import NotAnAnswer

            raise NotAnAnswer("a serial number begins with KEL")

    second = line.ask("B", "Scan the serial number", "input", fits=fits)
    first = line.ask("A", "Scan the serial number", "input", fits=fits)
    third = line.ask("C", "Scan the serial number", "input", fits=fits)
    browser.open(line.page.url)
    browser.ready()
    assert (browser.text("#who-slot"), browser.text("#others-list")) == ("Slot B", "AC")
    browser.type("42", Keys.ENTER)
    browser.wait_text("#message", "“42” does not fit: a serial number begins with KEL")
    browser.type("KEL2", Keys.ENTER)
    assert second.text() == "KEL2"
    browser.wait_text("#who-slot", "Slot A")
    browser.one('[data-slot="C"] .choose').click()
    browser.wait_text("#who-slot", "Slot C")
    browser.ready()
    browser.type("KEL3", Keys.ENTER)
    assert third.text() == "KEL3"
    browser.wait_text("#who-slot", "Slot A")
    browser.ready()
    browser.type("KE")
    first.give_up()
    browser.wait_text("#question", "Nothing is being asked.")
    again = line.ask("B", "Scan the serial number", "input", fits=fits)
    browser.wait_text("#who-slot", "Slot B")
    browser.ready()
    browser.type("L1", Keys.ENTER)
    browser.wait_text("#message", "Another question is asked by now; “KEL1” was not used.")
    assert again.answer is None, "a code that was begun for another slot"
    again.give_up()
    browser.wait_text("#question", "Nothing is being asked.")
    browser.type("KEL9", Keys.ENTER)
    browser.wait_text("#message", "Nothing asks for “KEL9”.")


def test_a_slot_is_stopped_after_it_was_asked_once_more(browser: Browser, line: ToldLine) -> None:
    for slot in ("A", "B"):
        line.slot(slot)
    line.began("A")
    run = line.began("B", "KEL7")
    browser.open(line.page.url)
    browser.wait_look("B", "running")
    stop = browser.one('[data-slot="B"] .stop')
    stop.click()
    assert browser.text("#stop-question") == "Stop slot B? KEL7"
    browser.picture("line-stop")
    browser.type(Keys.ESCAPE)
    browser.wait(lambda: not browser.all("dialog[open]"), "the dialog gone")
    stop.click()
    browser.type(Keys.ENTER)
    browser.wait(lambda: not browser.all("dialog[open]"), "the dialog gone")
    assert line.stopped == [], "to let it go on is what Enter means"
    stop.click()
    line.ended("B", run, "PASS")
    browser.wait(lambda: not browser.all("dialog[open]"), "the dialog gone with its run")
    run = line.began("B", "KEL8")
    browser.wait_text('[data-slot="B"] .dut', "KEL8")
    browser.one('[data-slot="B"] .stop').click()
    browser.one("#stop-yes").click()
    browser.wait(lambda: line.stopped, "the slot stopped")
    assert line.stopped == ["B"]


def test_a_reload_in_the_middle_shows_the_same(browser: Browser, line: ToldLine) -> None:
    for slot in ("A", "B", "C"):
        line.slot(slot)
    run = line.began("A")
    line.step_ended("A", run, 1)
    line.step_ended("A", run, 2, "skipped")
    line.step("A", run, 3, "screen")
    asked = line.ask("A", "Is the screen white?", run=run)
    failed(line, "B", line.began("B"))
    browser.open(line.page.url)
    browser.ready()
    browser.wait_look("B", "fail")
    before = seen(browser)
    assert before["steps"][0] == ["pass", "skipped", "now", ""]
    browser.driver.refresh()
    browser.ready()
    browser.wait_look("B", "fail")
    assert seen(browser) == before
    browser.type("y")
    assert asked.text() == "yes"


def test_a_server_that_is_gone_is_seen_and_found_again(browser: Browser, line: ToldLine) -> None:
    line.slot("A")
    failed(line, "A", line.began("A"))
    browser.open(line.page.url)
    browser.wait_look("A", "fail")
    line.close()
    browser.wait_text("#gone", "The line was ended at")
    assert browser.one("#gone").is_displayed() and browser.all("body.is-gone")
    assert browser.tile("A", ".word") == "FAIL", "what was last known is still there"
    browser.picture("line-gone")
    again = ToldLine(port=line.page.port)
    try:
        again.slot("A")
        asked = again.ask("A", "Is the screen white?")
        browser.wait_look("A", "asking")
        browser.wait(lambda: not browser.one("#gone").is_displayed(), "found again")
        browser.ready()
        browser.type("y")
        assert asked.text() == "yes", "with the token of the new server"
    finally:
        again.close()


def test_whatever_a_handset_says_is_only_read(browser: Browser, line: ToldLine) -> None:
    slot = HOSTILE
    line.slot(slot, "held", HOSTILE)
    browser.open(line.page.url)
    browser.wait(lambda: browser.text(".tile .what") == SHOWN, "the text as it is")
    run = line.began(slot, HOSTILE)
    line.step(slot, run, 1, HOSTILE)
    line.stream.send("notice", slot=slot, run=run, number=1, text=HOSTILE)
    asked = line.ask(slot, HOSTILE, run=run)
    browser.ready()
    assert (browser.text("#who-slot"), browser.text("#who-dut"), browser.text("#question")) == (
        f"Slot {SHOWN}", SHOWN, SHOWN)
    browser.one(".stop").click()
    assert browser.text("#stop-question") == f"Stop slot {SHOWN}? {SHOWN}"
    browser.type(Keys.ESCAPE)
    browser.picture("line-hostile")
    asked.give_up()
    line.step_ended(slot, run, 1, "fail", HOSTILE, reason=HOSTILE,
                    values=[{**VALUE, "name": HOSTILE, "reason": HOSTILE}])
    line.ended(slot, run, "FAIL", HOSTILE, HOSTILE, HOSTILE)
    browser.wait(lambda: browser.all('.tile[data-look="fail"]'), "the verdict")
    assert browser.text(".tile .what") == SHOWN and browser.text(".state") == SHOWN
    assert browser.script("return window.hacked") is None
    assert not browser.all("main img[src=x]") and not browser.all("main script")


def test_the_page_is_used_by_the_keyboard_alone(browser: Browser, line: ToldLine) -> None:
    line.slot("A")
    run = line.began("A")
    browser.open(line.page.url)
    browser.wait_look("A", "running")
    browser.wait(lambda: browser.focused() == "field", "the scanner's field")
    browser.script("document.querySelector('.skip').focus()")
    order: list[str] = []
    for _ in range(8):
        browser.type(Keys.TAB if order else Keys.SHIFT)
        order.append(browser.focused())
        outline = browser.script("return getComputedStyle(document.activeElement).outlineStyle")
        assert outline == "solid", f"nobody sees the focus on {order[-1]}"
        if order[-1] == "field":
            break
    assert order == ["To the content", "Line", "tone", "English", "Stop: Slot A", "field"]
    browser.type_back()
    assert browser.focused() == "Stop: Slot A"
    browser.type(Keys.ENTER)
    assert browser.focused() == "Let it go on"
    browser.type(Keys.TAB, Keys.SPACE)
    browser.wait(lambda: line.stopped, "the slot stopped")
    browser.wait(lambda: browser.focused() == "field", "the scanner's field")
    asked = line.ask("A", "Is the screen white?", run=run)
    browser.ready()
    browser.script("document.getElementById('tone').focus()")
    browser.type("n")
    assert asked.text() == "no", "a key answers wherever the focus is"
    asked = line.ask("A", "Is the screen white?", run=run)
    browser.ready()
    browser.script("document.getElementById('yes').focus()")
    browser.type(Keys.ENTER)
    assert asked.text() == "yes"
    browser.script("document.getElementById('tone').focus()")
    browser.type(Keys.ESCAPE)
    assert browser.focused() == "field"


def test_a_tone_is_off_until_it_is_wanted_and_remembered(browser: Browser,
                                                         line: ToldLine) -> None:
    line.slot("A")
    browser.open(line.page.url)
    browser.wait_look("A", "waiting")
    browser.script("window.tones = []; const start = OscillatorNode.prototype.start;"
                   "OscillatorNode.prototype.start = function (when) {"
                   " window.tones.push([this.type, this.frequency.value]);"
                   " return start.call(this, when); }")
    tone = browser.one("#tone")
    assert tone.get_attribute("aria-pressed") == "false"
    line.ended("A", line.began("A"), "FAIL")
    browser.wait_look("A", "fail")
    assert browser.script("return window.tones") == []
    tone.click()
    assert tone.get_attribute("aria-pressed") == "true"
    browser.script("window.tones.length = 0")
    line.ended("A", line.began("A"), "PASS")
    browser.wait(lambda: len(browser.script("return window.tones")) == 2, "the tone of a pass")
    assert browser.script("return window.tones") == [["sine", 660], ["sine", 880]]
    browser.driver.refresh()
    assert browser.one("#tone").get_attribute("aria-pressed") == "true"
    browser.forget()


@pytest.mark.parametrize("code, word, question", [
    ("de", "GUT", "Es wird nichts gefragt."), ("zh-Hans", "合格", "当前没有提问。")])
def test_the_page_speaks_other_languages(browser: Browser, line: ToldLine, code: str, word: str,
                                         question: str) -> None:
    line.slot("A")
    line.ended("A", line.began("A"), "PASS")
    browser.open(line.page.url)
    browser.one(".language summary").click()
    browser.one(f'.language a[lang="{code}"]').click()
    browser.wait_look("A", "pass")
    assert (browser.tile("A", ".word"), browser.text("#question")) == (word, question)
    browser.picture(f"line-{code}")
    browser.open(line.page.url)
    assert browser.script("return document.documentElement.lang") == code, "remembered"


@pytest.mark.parametrize("size", [DESKTOP, TABLET, UPRIGHT])
def test_32_slots_fit_and_are_legible(browser: Browser, line: ToldLine,
                                      size: tuple[int, int]) -> None:
    verdicts = ("PASS", "FAIL", "ERROR", "ABORTED")
    for number in range(1, 33):
        line.slot(str(number))
        run = line.began(str(number), f"KEL{number:010d}")
        if number % 5:
            line.ended(str(number), run, verdicts[number % 4], f"KEL{number:010d}",
                       "battery ADC: adc is 4050 mV, more than 4000 mV")
        else:
            line.step(str(number), run, 1, "battery ADC")
    asked = line.ask("5", "Is the screen white?")
    browser.size(size)
    browser.open(line.page.url)
    browser.ready()
    browser.wait(lambda: len(browser.all(".tile")) == 32, "32 tiles")
    found = browser.wait(lambda: browser.script(
        "const place = document.getElementById('tiles');"
        "const box = place.getBoundingClientRect();"
        "const bad = [...document.querySelectorAll('.tile')].filter((tile) => {"
        "  const one = tile.getBoundingClientRect();"
        "  const word = tile.querySelector('.word');"
        "  const main = tile.querySelector('.main').getBoundingClientRect();"
        "  const body = tile.querySelector('.body');"
        "  return one.bottom > box.bottom + 1 || one.right > box.right + 1"
        "    || word.getBoundingClientRect().right > one.right - 2"
        "    || Number.parseFloat(getComputedStyle(word).fontSize) < 14"
        "    || main.height < 14 || body.scrollHeight > body.clientHeight + 1;"
        "});"
        "const settled = getComputedStyle(place).gridTemplateColumns.split(' ').length > 1;"
        "return settled && [bad.map((tile) => tile.dataset.slot + tile.dataset.look),"
        " place.scrollHeight <= place.clientHeight + 1,"
        " document.documentElement.scrollWidth <= innerWidth]"), "tiles laid out")
    browser.picture(f"line-32-{size[0]}x{size[1]}")
    assert found == [[], True, True]
    asked.give_up()
