"""The words of the pages: every language has them all, and none is left over."""

from __future__ import annotations

import json
import re
from dataclasses import fields
from pathlib import Path

import pytest

import amt_line.view.web as web
from amt_line.drawing.words import Words
from amt_line.view.web.language import DEFAULT, best, languages
from amt_line.view.web.search import VERDICTS

FOLDER = Path(web.__file__).parent
# Keys that are put together of a beginning and one of these.
FAMILIES = {
    "verdict.": [*(word.lower() for word in VERDICTS), "skipped"],
    "look.": ["running", "asking", "waiting", "held", "defect", "ended"],
    "problem.": ["gone", "unfit", "unreachable"],
    "room.": ["line", "runs", "statistics"],
    "status.": ["400", "401", "403", "404", "421", "500", "503", "other"],
    "run.": ["setup", "always"],
    "draw.": [field.name for field in fields(Words)],
    "table.": ["plans", "stations", "slots", "days", "failures-by-step", "values", "step-times"],
    "column.": ["runs", "pass", "fail", "error", "aborted", "handsets", "first-pass", "at-the-end",
                "retests", "run", "takt", "plan", "station", "slot", "day", "step", "share",
                "with-those-above", "failed", "errors", "value", "limits", "count", "mean",
                "deviation", "smallest", "largest", "cp", "cpk", "near", "out", "median",
                "95-up-to", "share-of-time"],
    "runs.": ["verdict", "dut", "plan", "slot", "station", "began", "seconds"],
}


def words_of(code: str) -> dict[str, str]:
    """The words as their file has them; a key that stands twice is found."""
    def once(pairs: list[tuple[str, str]]) -> dict[str, str]:
        assert len({key for key, _ in pairs}) == len(pairs), "a key stands twice"
        return dict(pairs)

    text = (FOLDER / "words" / f"{code}.json").read_text(encoding="utf-8")
    words: dict[str, str] = json.loads(text, object_pairs_hook=once)
    return words


def sources() -> str:
    """Everything that uses words."""
    return "\n".join(path.read_text(encoding="utf-8") for path in sorted(FOLDER.rglob("*"))
                     if path.suffix in (".py", ".js", ".html"))


def test_there_are_three_languages() -> None:
    assert set(languages()) == {"en", "de", "zh-Hans"}
    assert [language.name for _, language in sorted(languages().items())] == [
        "Deutsch", "English", "简体中文"]


@pytest.mark.parametrize("code", ["de", "zh-Hans"])
def test_every_language_has_the_same_keys_and_places(code: str) -> None:
    english, other = words_of(DEFAULT), words_of(code)
    assert list(english) == list(other)
    for key, text in english.items():
        places = re.findall(r"\{\w+\}", text)
        assert sorted(places) == sorted(re.findall(r"\{\w+\}", other[key])), key
        assert other[key].strip() and text.strip(), key


def test_chinese_is_chinese() -> None:
    plain = {key for key, text in words_of("zh-Hans").items()
             if not re.search("[\u4e00-\u9fff]", text)}
    assert plain <= {"yes.keys", "no.keys", "column.cp", "column.cpk"}, plain


def test_no_key_is_unused_and_none_is_missing() -> None:
    text = sources()
    used = set(re.findall(r"""["']([a-z]+(?:\.[a-z0-9-]+)*)["']""", text))
    family = {prefix + word for prefix, words in FAMILIES.items() for word in words}
    keys = set(words_of(DEFAULT))
    assert not keys - used - family, "unused"
    assert family <= keys
    asked = set(re.findall(r"""\b(?:t|word)\(\s*["']([^"']+)["']\s*[,)]""", text))
    assert asked <= keys, "missing"


@pytest.mark.parametrize("accepted, code", [
    ("", "en"), ("de", "de"), ("de-AT,en;q=0.5", "de"), ("fr, de;q=0.7, en;q=0.8", "en"),
    ("zh-CN,zh;q=0.9", "zh-Hans"), ("zh-Hans-SG", "zh-Hans"), ("fr", "en"), ("*", "en"),
    ("de;q=0, zh;q=0.1", "zh-Hans"), ("de;q=x,zh", "zh-Hans"), ("DE", "de"),
    ("\u00e9,;;q==", "en"), ("de," * 10000, "de")])
def test_the_browser_chooses_the_language(accepted: str, code: str) -> None:
    assert best(accepted) == code
