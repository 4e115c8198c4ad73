"""Reports: all are made from records, from nothing else."""
