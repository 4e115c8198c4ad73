"""Run one of the tools: `python3 -P -m tools TOOL [ARGUMENTS]`, as ./dev does.

Nothing slow is imported before signals are taken, so that an early Ctrl-C is no traceback either.
"""

import importlib
import sys

from tools.children import guard


def main() -> int:
    """Import the tool and run it."""
    name = sys.argv.pop(1)
    tool = importlib.import_module(f"tools.{name}")
    return int(tool.main())


if __name__ == "__main__":
    sys.exit(guard(main))
