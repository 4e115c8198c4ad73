"""Speaks on all lines of two handsets at once, and knows from a model what must be answered."""
