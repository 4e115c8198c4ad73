"""The test station's side of the handset's manufacturing-test protocol."""

__version__ = "1.1"
