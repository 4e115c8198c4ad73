"""Fixtures of the tools' tests."""

from pathlib import Path

import pytest
from dev_copy import Copy


@pytest.fixture
def copy(tmp_path: Path) -> Copy:
    """A copy of the project's tools."""
    return Copy(tmp_path)
