"""What the Python files of the project import of each other."""

import ast
from pathlib import Path
from typing import Iterator

from tools.project import PROJECT


def imported_by(name: str) -> set[str]:
    """The files of the project that a file imports itself, wherever in it."""
    tree = ast.parse((PROJECT / name).read_bytes(), name)
    found = set()
    for node in ast.walk(tree):
        if isinstance(node, ast.Import):
            found.update(_files(alias.name for alias in node.names))
        elif isinstance(node, ast.ImportFrom):
            package = node.module or ""
            if node.level:
                parents = Path(name).parts[:-node.level]
                package = ".".join([*parents, *([package] if package else [])])
            for alias in node.names:
                found.update(_files([f"{package}.{alias.name}"]) or _files([package]))
    return found - {name}


def _files(modules: "list[str] | Iterator[str]") -> set[str]:
    """The files of modules; those of others have none."""
    found = set()
    for module in modules:
        path = Path(*module.split("."))
        for candidate in (path.with_suffix(".py"), path / "__init__.py"):
            if (PROJECT / candidate).is_file():
                found.add(str(candidate))
    return found
