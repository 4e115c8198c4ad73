"""What every page is made by: strict templates, everything from outside escaped, shared filters."""

from __future__ import annotations

from functools import lru_cache

from jinja2 import Environment, PackageLoader, StrictUndefined

from amt_line.drawing.days import share_text
from amt_line.report.records import (decoded_text, duration, number_text, printable_lines,
                                     spaced_hex, value_text)


@lru_cache(maxsize=None)
def environment_of(package: str) -> Environment:
    """The templates of a package, which may add to what they can call."""
    environment = Environment(loader=PackageLoader(package, "templates"), autoescape=True,
                              undefined=StrictUndefined, trim_blocks=True, lstrip_blocks=True)
    environment.filters.update(safe_text=printable_lines, hex=spaced_hex, decoded=decoded_text,
                               duration=duration, number=number_text, share=share_text)
    environment.globals.update(value_text=value_text)
    return environment
