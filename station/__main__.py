"""``python3 -m station`` is the ``amt-station`` command."""

from station.cli import main

if __name__ == "__main__":
    main()
