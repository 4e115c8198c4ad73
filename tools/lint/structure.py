"""The rooms of the house: nothing includes or imports upwards, and no file is out of proportion."""

from typing import Iterable, Mapping

from tools.lint.files import cpp_files, of_kind, project_files
from tools.lint.imports import imported_by
from tools.lint.includes import included_by
from tools.lint.rooms import (CPP_FLOORS, FILE_LINES, HEADER_LINES, LONG_FILES, PYTHON_FLOORS,
                              SHORT_HEADERS, Floors)
from tools.lint.verdict import Verdict
from tools.project import PROJECT

Links = Mapping[str, Iterable[str]]


def room_of(name: str, floors: Floors) -> tuple[int, str] | None:
    """The floor and the room that a file lies in."""
    fitting = [(len(room), floor, room) for floor, rooms in enumerate(floors) for room in rooms
               if name == room or name.startswith((f"{room}/", f"{room}.", f"{room}-"))]
    return max(fitting)[1:] if fitting else None


def check_floors(links: Links, floors: Floors) -> list[str]:
    """Files in no room, includes that go up, and rooms that include each other."""
    findings = []
    crossings: dict[tuple[str, str], str] = {}
    for name, others in sorted(links.items()):
        place = room_of(name, floors)
        if place is None:
            findings.append(f"{name}: error: lies in no room that tools/lint/rooms.py names")
            continue
        for other in sorted(others):
            there = room_of(other, floors)
            if there is None or there[1] == place[1]:
                continue
            if there[0] > place[0]:
                findings.append(f"{name}: error: includes {other}, which stands above it "
                                f"({place[1]} is below {there[1]})")
            if there[0] == place[0]:
                crossings.setdefault((place[1], there[1]), f"{name} includes {other}")
    for (one, other), said in sorted(crossings.items()):
        if one < other and (other, one) in crossings:
            findings.append(f"{one}: error: {one} and {other} include each other: {said}, "
                            f"{crossings[other, one]}")
    return findings


def count_lines(name: str) -> int:
    """How long a file is."""
    return (PROJECT / name).read_bytes().count(b"\n")


def check_headers(headers: Iterable[str]) -> list[str]:
    """Headers that are too short to be one, and reasons that are not needed any more."""
    short = {name for name in headers if count_lines(name) < HEADER_LINES}
    findings = [f"{name}: error: a header of {count_lines(name)} lines (join it, or give the "
                "reason in tools/lint/rooms.py)" for name in sorted(short - set(SHORT_HEADERS))]
    findings += [f"{name}: error: tools/lint/rooms.py gives a reason for a short header that is "
                 "not there" for name in sorted(set(SHORT_HEADERS) - short)]
    return findings


def check_structure(_files: list[str]) -> Verdict:
    """Does the house stand as it is drawn? Always the whole of it: one file moves many."""
    files = project_files()
    cpp = cpp_files(files, ".cpp", ".h")
    python = of_kind(files, ".py")
    findings = check_floors({name: included_by(name) for name in cpp}, CPP_FLOORS)
    findings += check_floors({name: imported_by(name) for name in python}, PYTHON_FLOORS)
    findings += check_headers(name for name in cpp_files(files, ".h")
                              if not name.startswith("tests/"))
    findings += [f"{name}: error: {count_lines(name)} lines, more than {FILE_LINES}"
                 for name in [*cpp, *python]
                 if count_lines(name) > FILE_LINES and name not in LONG_FILES]
    return Verdict(len(cpp) + len(python), findings)
