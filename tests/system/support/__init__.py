"""What the system tests share."""
