"""How much of the code the tests run."""
