"""How long the handsets are kept under load, and of which build."""

import pytest


def pytest_addoption(parser: pytest.Parser) -> None:
    """The time of each load, and the daemon under it."""
    parser.addoption("--soak-seconds", type=float, default=15.0,
                     help="seconds for each load (default: %(default)s)")
    parser.addoption("--handset-build", default="release",
                     help="preset whose daemon is tested (default: %(default)s)")
