"""How many cases are drawn, and of which build."""

import pytest


def pytest_addoption(parser: pytest.Parser) -> None:
    """The length of the sample, and the daemon that is to stand it."""
    parser.addoption("--torture-cases", type=int, default=100,
                     help="how many calls fail, one after another (default: %(default)s)")
    parser.addoption("--torture-jobs", type=int, default=2,
                     help="handsets at once (default: %(default)s)")
    parser.addoption("--handset-build", default="release",
                     help="preset whose daemon is tested (default: %(default)s)")
