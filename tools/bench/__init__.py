"""What `./dev bench` measures."""
