"""Reads records back, and the small things that every report needs of them."""

from __future__ import annotations

import json
from collections import Counter
from functools import lru_cache
from pathlib import Path
from typing import Any, Mapping, Sequence

from amt_line.run.record import VERSION
from amt_station.errors import UsageProblem
from amt_station.text import printable

Record = dict[str, Any]

_LARGEST_FILE = 256 * 1024 * 1024


@lru_cache(maxsize=1)
def _validator() -> Any:
    from jsonschema import Draft202012Validator

    from amt_line.run.record_schema import record_schema

    return Draft202012Validator(record_schema())


def _no_number(word: str) -> None:
    raise ValueError(f"{word} is no number")


def load_record(path: Path) -> Record:
    """A record from its file; ``UsageProblem`` when it is none."""
    try:
        if path.exists() and not path.is_file():
            raise UsageProblem(f"{path}: no file")
        if path.stat().st_size > _LARGEST_FILE:
            raise UsageProblem(f"{path}: larger than {_LARGEST_FILE} bytes")
        content = json.loads(path.read_text(encoding="utf-8"), parse_constant=_no_number)
    except OSError as error:
        raise UsageProblem(f"{path}: {error.strerror}") from error
    except (ValueError, RecursionError) as error:
        raise UsageProblem(f"{path}: no record: {error}") from error
    version = content.get("record") if isinstance(content, dict) else None
    if isinstance(version, int) and version > VERSION:
        raise UsageProblem(f"{path}: a record of version {version}; this program knows {VERSION}")
    try:
        wrong = next(_validator().iter_errors(content), None)
    except RecursionError:
        raise UsageProblem(f"{path}: no record: nested too deep") from None
    if wrong is not None:
        where = "/".join(map(str, wrong.absolute_path)) or "document"
        raise UsageProblem(f"{path}: no record: {printable(where)}: "
                           f"{printable(wrong.message)[:200]}")
    return content  # type: ignore[no-any-return]


def load_records(paths: Sequence[Path]) -> list[Record]:
    """Several records, in the order of their begin."""
    return sorted(map(load_record, paths), key=lambda record: str(record["began"]))


def verdict_word(record: Mapping[str, Any]) -> str:
    """The verdict; a run that did not come to one is not finished."""
    return str(record["verdict"] or "UNFINISHED")


def counts(record: Mapping[str, Any]) -> str:
    """How many steps ended how."""
    tally = Counter(step["verdict"] for step in record["steps"])
    return ", ".join(f"{tally[word]} {word}" for word in ("pass", "fail", "error", "skipped")
                     if tally[word])


def number_text(value: float) -> str:
    """A number without digits that say nothing."""
    return f"{value:.10g}"


def value_text(value: Mapping[str, Any]) -> str:
    """A value for people: its word, else the number with its unit, else the text."""
    if "word" in value:
        return f"{value['word']} ({value['value']})"
    if isinstance(value["value"], str):
        return printable(value["value"])
    unit = f" {value['unit']}" if "unit" in value else ""
    return number_text(value["value"]) + unit


def limits_text(value: Mapping[str, Any]) -> str:
    """The limits of a value for people."""
    limits, parts = value.get("limits", {}), []
    unit = f" {value['unit']}" if "unit" in value else ""
    if "min" in limits and "max" in limits:
        parts.append(f"{number_text(limits['min'])} to {number_text(limits['max'])}{unit}")
    elif "min" in limits:
        parts.append(f"at least {number_text(limits['min'])}{unit}")
    elif "max" in limits:
        parts.append(f"at most {number_text(limits['max'])}{unit}")
    if "one_of" in limits:
        parts.append(" or ".join(printable(str(item)) for item in limits["one_of"]))
    if "matches" in limits:
        parts.append(f"matches {printable(limits['matches'])}")
    return ", ".join(parts)


def remark(step: Mapping[str, Any]) -> str:
    """A step's reason, or else its values, on one line."""
    if step["reason"]:
        return printable(step["reason"])
    return ", ".join(f"{printable(value['name'])} {value_text(value)}" for value in step["values"]
                     if value["name"] != "result" and value["value"] != "")


def duration(seconds: float | None) -> str:
    """A time for people."""
    if seconds is None:
        return ""
    return f"{seconds * 1000:.0f} ms" if seconds < 1 else f"{seconds:.1f} s"


def printable_lines(text: object) -> str:
    """A text with everything that cannot be shown written out."""
    return printable(str(text))


def spaced_hex(text: str) -> str:
    """Bytes in hexadecimal, told apart."""
    return " ".join(text[index:index + 2] for index in range(0, len(text), 2))


def decoded_text(item: Mapping[str, Any]) -> str:
    """What went over the line, in words."""
    kind = item["kind"]
    if kind == "text":
        return printable(item["text"])
    if kind == "skipped":
        return f"{len(item['bytes']) // 2} bytes skipped: {printable(item['why'])}"
    if kind == "acknowledgement":
        return "acknowledgement"
    packet = item["packet"]
    atoms = ", ".join(map(_atom_text, packet["atoms"]))
    return f"{packet['id']} {printable(packet['name'])}" + (f": {atoms}" if atoms else "")


def _atom_text(atom: Mapping[str, Any]) -> str:
    name = printable(str(atom["name"] or atom["id"]))
    return f"{name}={printable(str(atom.get('text', atom['value'])))}"
