"""Carrying out a plan with one handset: the runner, its events, and the record of the run."""
