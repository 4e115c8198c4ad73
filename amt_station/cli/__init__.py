"""``amt-station``: the command-line test station, one command a file."""
