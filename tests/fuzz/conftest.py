"""How long the fuzz targets run."""

import pytest


def pytest_addoption(parser: pytest.Parser) -> None:
    """The time of each target."""
    parser.addoption("--fuzz-seconds", type=int, default=3,
                     help="seconds for each fuzz target (default: %(default)s)")
