"""What `./dev fuzz` runs."""
