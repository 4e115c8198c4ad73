"""Live views of a run: made from its events, from nothing else."""
