"""Makes the typed commands from the request table: ``python3 -m amt_station.handset_source``.

It writes ``enums.py``, ``records.py``, ``groups.py`` and ``commands.py`` of ``handset``; a test
holds that they are what the table makes.
"""

from __future__ import annotations

import textwrap
from pathlib import Path
from typing import Iterable, Mapping

from amt_station.requests.model import RESULT, Channel, Field, Operation, Request
from amt_station.requests.table import operations

_DIRECTORY = Path(__file__).with_name("handset")
_HEAD = ('"""{title}\n\nMade from the request table by ``python3 -m amt_station.handset_source``; '
         'do not change it by hand.\n"""\n\nfrom __future__ import annotations\n\n')
_WIDTH = 100

# A blank at which no line ends.
_TIED = "\u00a0"


def _camel(*words: str) -> str:
    return "".join(part.capitalize() for word in words for part in word.split("-"))


def _name(word: str) -> str:
    return word.replace("-", "_")


def _document(text: str, indent: str) -> list[str]:
    """A docstring of any length."""
    text = text[:1].upper() + text[1:]
    if len(indent) + len(text) + 6 <= _WIDTH:
        return [f'{indent}"""{text}"""']
    lines = textwrap.wrap(text, _WIDTH - len(indent) - 3)
    return [f'{indent}"""{lines[0]}', *(indent + line for line in lines[1:]), f'{indent}"""']


def _answers(row: Request, operation: Operation) -> list[tuple[Field, bool]]:
    """The fields of a command's record, and whether they are always there."""
    if not operation.brings:
        return []
    fields = [field for field in row.answer_fields if field is not RESULT]
    ordered = sorted(fields, key=lambda field: field.name not in operation.brings)
    return [(field, field.name in operation.brings) for field in ordered]


def _asked(row: Request, operation: Operation) -> list[tuple[Field, bool]]:
    return [(row.field(name), name in operation.takes)
            for name in (*operation.takes, *operation.may_take)]


def _choice_fields() -> dict[str, Field]:
    """Every field with choices that a method or a record shows, by name."""
    found: dict[str, Field] = {}
    for row, operation in operations():
        for field, _ in (*_asked(row, operation), *_answers(row, operation)):
            if field.choices:
                known = found.setdefault(field.name, field)
                assert known.choices == field.choices, f"two kinds of {field.name}"
    return found


def enums_source() -> str:
    """The enumerations."""
    parts = [_HEAD.format(title="What the numbers of requests and answers stand for.")
             + "from enum import IntEnum\nfrom typing import Mapping\n"]
    fields = _choice_fields()
    for name, field in sorted(fields.items()):
        lines = ["", "", f"class {_camel(name)}(IntEnum):", *_document(f"{field.meaning}.", "    "),
                 ""]
        lines += [f"    {_name(word).upper()} = {value}" for word, value in field.choices.items()]
        parts.append("\n".join(lines) + "\n")
    rows = "\n".join(f'    "{_name(name)}": {_camel(name)},' for name in sorted(fields))
    parts.append("\n\nENUMS: Mapping[str, type[IntEnum]] = {\n" + rows + "\n}\n")
    return "".join(parts)


def _unit(field: Field) -> str:
    return f", in {field.unit}" if field.unit and " " not in field.unit else ""


def _shown_type(field: Field) -> str:
    if field.choices:
        return f"{_camel(field.name)} | int"
    if not field.numeric:
        return "str"
    return "float" if field.scale != 1 else "int"


def _records() -> list[tuple[Request, Operation]]:
    return [(row, operation) for row, operation in operations() if operation.brings]


def records_source() -> str:
    """The results, one frozen record a command that brings something."""
    used = sorted({_camel(field.name) for row, operation in _records()
                   for field, _ in _answers(row, operation) if field.choices})
    parts = [_HEAD.format(title="What the typed commands bring, in the units that they name.")
             + "from dataclasses import dataclass\n\n"
             + "from amt_station.handset.base import Result\n"
             + f"from amt_station.handset.enums import {', '.join(used)}\n"]
    for row, operation in _records():
        lines = ["", "", "@dataclass(frozen=True)", f"class {_camel(*operation.path)}(Result):",
                 *_document(f"What `{operation.name}` brings.", "    ")]
        for field, always in _answers(row, operation):
            kind = _shown_type(field)
            lines += ["", f"    {_name(field.name)}: {kind}" if always
                      else f"    {_name(field.name)}: {kind} | None = None"]
            unit = _unit(field)
            lines += _document(f"{field.meaning}{unit}.", "    ")
        parts.append("\n".join(lines) + "\n")
    return "".join(parts)


def _parameter(field: Field, needed: bool) -> str:
    kind = (_camel(field.name) if field.choices else "int") if field.numeric else "str"
    text = f"{_name(field.name)}: {kind}{'' if needed else ' | None = None'}"
    return text.replace(" ", _TIED)


def _where(row: Request, operation: Operation) -> str:
    served = [channel for channel in operation.channels if row.service(channel) is not None]
    if len(served) == 2:
        return "either channel"
    return "PC line only" if served == [Channel.PC] else "app channel only"


def _method(row: Request, operation: Operation) -> list[str]:
    asked = _asked(row, operation)
    record = _camel(*operation.path) if operation.brings else "Done"
    parameters = [_parameter(field, needed) for field, needed in asked]
    parameters += ["force: bool = False".replace(" ", _TIED)] if asked else []
    parameters.append("timeout: float | None = None".replace(" ", _TIED))
    head = f"    def {_name(operation.path[-1])}("
    lines = _wrapped(head, f"self, *, {', '.join(parameters)}){_TIED}->{_TIED}{record}:")
    limits = "".join(f" {_name(field.name)}: {field.meaning}"
                     + f"{_unit(field)}." for field, _ in asked)
    lines += _document(f"{operation.summary} ({_where(row, operation)}).{limits}", "        ")
    values = ", ".join(f'"{field.name}": {_name(field.name)}' for field, _ in asked)
    force = "force" if asked else "False"
    lines += _wrapped("        return self._carry_out(",
                      f'{record}, "{operation.name}", {{{values}}}, {force}, timeout)')
    return ["", *lines]


def _wrapped(head: str, rest: str) -> list[str]:
    """A call or a definition, its continuation lines below its opening bracket."""
    words = textwrap.wrap(rest, _WIDTH - len(head), break_long_words=False, break_on_hyphens=False)
    lines = [head + words[0], *(" " * len(head) + word for word in words[1:])]
    return [line.replace(_TIED, " ") for line in lines]


def _tree() -> dict[tuple[str, ...], list[tuple[Request, Operation]]]:
    """Group path to the commands directly in it, every group on the way included."""
    tree: dict[tuple[str, ...], list[tuple[Request, Operation]]] = {(): []}
    for row, operation in operations():
        for depth in range(1, len(operation.path)):
            tree.setdefault(operation.path[:depth], [])
        tree[operation.path[:-1]].append((row, operation))
    return tree


def _group_lines(path: tuple[str, ...],
                 tree: Mapping[tuple[str, ...], list[tuple[Request, Operation]]]) -> list[str]:
    below = [other for other in tree if other[:-1] == path and len(other) == len(path) + 1]
    lines = []
    if below:
        lines += ["", "    def __init__(self, link: Link) -> None:",
                  "        super().__init__(link)"]
        lines += [f"        self.{_name(other[-1])} = {_camel(*other)}Group(link)"
                  for other in sorted(below)]
    for row, operation in tree[path]:
        lines += _method(row, operation)
    return lines


def _imports(lines: Iterable[str], names: Mapping[str, Iterable[str]]) -> str:
    """Imports of those names that the lines use."""
    text = "\n".join(lines)
    found = []
    for module, candidates in names.items():
        used = sorted({name for name in candidates if _uses(text, name)})
        if used:
            plain = f"from {module} import {', '.join(used)}"
            found += [plain] if len(plain) <= _WIDTH else _wrapped(
                f"from {module} import (", ", ".join(used) + ")")
    return "\n".join(found)


def _uses(text: str, name: str) -> bool:
    return any(text.find(f"{before}{name}{after}") >= 0 for before in (" ", "(")
               for after in (":", ",", ")", "(", " ", "="))


def _names(tree: Mapping[tuple[str, ...], object]) -> dict[str, list[str]]:
    return {
        "amt_station.handset.base": ["Done", "Group"],
        "amt_station.handset.enums": [_camel(name) for name in _choice_fields()],
        "amt_station.handset.groups": [f"{_camel(*path)}Group" for path in tree if path],
        "amt_station.handset.records": [_camel(*operation.path) for _, operation in _records()],
        "amt_station.link": ["Link"],
    }


def groups_source() -> str:
    """The groups of commands."""
    tree = _tree()
    lines: list[str] = []
    for path in sorted((path for path in tree if path), key=lambda path: (-len(path), path)):
        lines += ["", "", f"class {_camel(*path)}Group(Group):",
                  *_document(f"Commands that begin with `{' '.join(path)}`.", "    ")]
        lines += _group_lines(path, tree)
    names = {module: found for module, found in _names(tree).items()
             if module != "amt_station.handset.groups"}
    title = "The typed commands of more than one word, in groups as they are typed."
    return _HEAD.format(title=title) + _imports(lines, names) + "\n" + "\n".join(lines) + "\n"


def commands_source() -> str:
    """The class with all groups and the commands of one word."""
    tree = _tree()
    lines = ["", "", "class Commands(Group):",
             *_document("Every typed command of the request table.", "    ")]
    lines += _group_lines((), tree)
    title = "Every typed command as a method, those of more than one word in groups."
    imports = _imports(lines, _names(tree))
    return _HEAD.format(title=title) + imports + "\n" + "\n".join(lines) + "\n"


def sources() -> dict[str, str]:
    """File name to content."""
    return {"enums.py": enums_source(), "records.py": records_source(),
            "groups.py": groups_source(), "commands.py": commands_source()}


def main() -> None:
    """Write the files."""
    for name, text in sources().items():
        (_DIRECTORY / name).write_text(text, encoding="utf-8")


if __name__ == "__main__":
    main()
