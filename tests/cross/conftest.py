"""The tests of the emulated build hold the dialogues of the system tests."""

import sys
from pathlib import Path

sys.path.append(str(Path(__file__).resolve().parents[1] / "system"))
