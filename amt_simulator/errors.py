"""What can go wrong with a simulated handset, each a clear line."""


class HandsetError(Exception):
    """The handset cannot do what was asked; the text says why and what helps."""


class HandsetTimeout(HandsetError, AssertionError):
    """Something that was waited for did not happen in time."""
