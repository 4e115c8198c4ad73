"""What can be wrong with bytes, or with a value that bytes are to carry."""

from __future__ import annotations


class WireError(Exception):
    """Bytes that are not what the protocol allows, or a value that it cannot carry."""


class TruncatedError(WireError):
    """The bytes end before what they announce."""


class MagicError(WireError):
    """A frame does not begin with the magic word."""


class LengthError(WireError):
    """A length field that cannot be, or disagrees with another."""


class HeadError(WireError):
    """A packet or an atom does not begin with its head byte."""


class ChecksumError(WireError):
    """The checksum at the end of a frame is not that of its bytes."""


class AtomTypeError(WireError):
    """An atom with a value type that does not exist, or with the wrong length for its type."""


class ValueRangeError(WireError):
    """A value does not fit the field that is to carry it."""


class MissingAtomError(WireError):
    """A packet does not hold the value that is asked of it."""


class StrayBytesError(WireError):
    """Bytes between frames that are neither a frame nor text."""
