"""Atoms written as text: ``ATOM=TYPE:VALUE``."""

from __future__ import annotations

from amt_station.errors import UsageProblem
from amt_station.requests.model import Request
from amt_station.wire.atoms import Atom, AtomType
from amt_station.wire.errors import WireError

TYPES = {kind.label: kind for kind in AtomType}


def parse_atom(row: Request | None, text: str) -> Atom:
    """An atom from ``ATOM=TYPE:VALUE``; one that ``row`` names may leave its type out."""
    key, equals, value = text.partition("=")
    if not equals:
        raise UsageProblem(f"{text!r} is not ATOM=TYPE:VALUE")
    field = next((field for field in (row.fields if row else ()) if field.name == key), None)
    label, colon, content = value.partition(":")
    if colon and label in TYPES:
        return _typed_atom(field.atom if field else _atom_id(key), TYPES[label], content)
    if field is None:
        raise UsageProblem(f"{text!r} needs a type: one of {', '.join(TYPES)}, then a colon")
    return field.encode(value)


def _atom_id(text: str) -> int:
    try:
        return int(text, 0)
    except ValueError:
        raise UsageProblem(f"no atom {text!r} in this request") from None


def _typed_atom(atom_id: int, kind: AtomType, content: str) -> Atom:
    try:
        if kind is AtomType.INT:
            return Atom.integer(atom_id, int(content, 0))
        if kind is AtomType.BOOL:
            return Atom.boolean(atom_id, int(content, 0))
        if kind is AtomType.BYTES:
            return Atom.raw(atom_id, bytes.fromhex(content))
        return Atom.string(atom_id, content)
    except (ValueError, WireError) as error:
        raise UsageProblem(f"atom {atom_id}: {error}") from error
