"""Atoms written as text: ``ATOM=TYPE:VALUE``."""

from __future__ import annotations

from amt_station.errors import UsageProblem, ValueProblem
from amt_station.requests.field import Field
from amt_station.requests.model import Request
from amt_station.wire.atoms import Atom, AtomType
from amt_station.wire.errors import WireError

TYPES = {kind.label: kind for kind in AtomType}


def parse_atom(row: Request | None, text: str, raw: bool = False) -> Atom:
    """An atom from ``ATOM=TYPE:VALUE``; one that ``row`` names may leave its type out.

    An atom of ``row`` has to be of the row's type, unless ``raw``.
    """
    key, equals, value = text.partition("=")
    if not equals:
        raise UsageProblem(f"{text!r} is not ATOM=TYPE:VALUE")
    fields = row.fields if row else ()
    field = next((field for field in fields if field.name == key), None)
    label, colon, content = value.partition(":")
    if colon and label in TYPES:
        atom = _typed_atom(field.atom if field else _atom_id(key), TYPES[label], content)
        if not raw:
            _check_type(atom, next((field for field in fields if field.atom == atom.id), None))
        return atom
    if field is None:
        raise UsageProblem(f"{text!r} needs a type: one of {', '.join(TYPES)}, then a colon")
    return field.encode(value, force=raw)


def _check_type(atom: Atom, field: Field | None) -> None:
    if field is None:
        return
    if atom.type is not field.type:
        raise ValueProblem(field.name, f"atom {atom.id} is of type {field.type.label}, not "
                           f"{atom.type.label} (--raw sends it all the same)")
    if field.width and len(atom.content) != field.width:
        raise ValueProblem(field.name, f"atom {atom.id} has {field.width} bytes, not "
                           f"{len(atom.content)} (--raw sends it all the same)")


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
