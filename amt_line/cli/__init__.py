"""The commands of a line, a command a file: check, run, show, report, schema."""
