"""Statistics of a line: definitions and figures. Pure: rows in, figures out."""
