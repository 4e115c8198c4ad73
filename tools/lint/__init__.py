"""Looks at every source file without running it."""
