"""A pass that was stored in the handset before the run turned out to be none."""

from __future__ import annotations

from typing import Any, Iterable, Mapping

Document = dict[str, Any]

_WHY = "a pass was told, and the run did not come to one"


def told_again(before: Document, again: Document) -> Document:
    """One step's document of both times that it was carried out."""
    first = before["attempts"]
    told = {"attempt": first, "verdict": before["verdict"], "reason": _WHY}
    return {**again, "began": before["began"], "attempts": first + again["attempts"],
            "seconds": round(before["seconds"] + again["seconds"], 6),
            "earlier": [*before["earlier"], told, *_behind(first, again["earlier"])],
            "exchanges": [*before["exchanges"], *_behind(first, again["exchanges"])],
            "remarks": [*before["remarks"], *again["remarks"]]}


def _behind(first: int, documents: Iterable[Mapping[str, Any]]) -> list[Document]:
    return [{**document, "attempt": first + document["attempt"]} for document in documents]


def not_taken_back(place: str) -> str:
    """What the record has to say when it could not be done."""
    return (f"{place} may have stored a pass in the handset, and the run is none: it could not be "
            "taken back")
