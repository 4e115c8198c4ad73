"""``amt-station`` begins here, also as ``python3 -m amt_station``.

What takes time is imported behind the handlers of the signals that end it; even ``typing`` does.
"""

import os
import signal

_WORDS = {int(signal.SIGINT): b"amt-station: interrupted\n",
          int(signal.SIGTERM): b"amt-station: terminated\n"}


def _leave(number: int, frame: object) -> None:
    try:
        os.write(2, _WORDS[number])
    finally:
        os._exit(128 + number)


def main() -> None:
    """The ``amt-station`` program; it does not return."""
    for number in _WORDS:
        signal.signal(number, _leave)
    from amt_station.cli.main import main as carry_out

    carry_out()


if __name__ == "__main__":
    main()
