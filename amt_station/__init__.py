"""The test station's side of the handset's manufacturing-test protocol."""
