"""What went over a line, as text that a person reads and a program reads back."""
