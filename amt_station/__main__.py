"""``amt-station`` begins here, also as ``python3 -m amt_station``.

What takes time is imported behind the handlers of the signals that end it.
"""

import os
import signal
from types import FrameType
from typing import NoReturn, Optional

_WORDS = {signal.SIGINT: b"amt-station: interrupted\n",
          signal.SIGTERM: b"amt-station: terminated\n"}


def _leave(number: int, frame: Optional[FrameType]) -> NoReturn:
    os.write(2, _WORDS[signal.Signals(number)])
    os._exit(128 + number)


def main() -> NoReturn:
    """The ``amt-station`` program."""
    for number in _WORDS:
        signal.signal(number, _leave)
    from amt_station.cli.main import main as carry_out

    carry_out()


if __name__ == "__main__":
    main()
