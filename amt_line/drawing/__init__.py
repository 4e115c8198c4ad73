"""Drawings: inline SVG, the same for files and for the page."""
