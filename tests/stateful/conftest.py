"""How long the handsets are spoken to, and of which build."""

import pytest


def pytest_addoption(parser: pytest.Parser) -> None:
    """The length of the run, what it is drawn from, and the daemon."""
    parser.addoption("--stateful-seconds", type=float, default=75.0,
                     help="seconds of the run (default: %(default)s)")
    parser.addoption("--stateful-seed", type=int,
                     help="what the steps are drawn from (default: 1 where CI is set, else any)")
    parser.addoption("--handset-build", default="asan",
                     help="preset whose daemon is tested (default: %(default)s)")
