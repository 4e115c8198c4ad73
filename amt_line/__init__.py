"""A production line: plans that are carried out with a handset, and the record of every run."""

import logging

# Whoever wants to read the log says where it goes.
logging.getLogger(__name__).addHandler(logging.NullHandler())
