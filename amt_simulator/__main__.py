"""`python3 -m amt_simulator` is the `amt-handset` command."""

from amt_simulator.cli import main

main()
