"""Looks for what goes wrong on a station's PC, and says what to do; changes nothing."""
