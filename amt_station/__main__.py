"""``python3 -m amt_station`` is the ``amt-station`` command."""

from amt_station.cli.main import main

if __name__ == "__main__":
    main()
