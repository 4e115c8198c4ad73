"""`python3 -m simulator` is the `handset` command."""

from .cli import main

main()
