"""The wire codec in one place: packets, atoms, envelope, checksum, and what can be wrong in them.

Everything here is bytes in, bytes out; nothing touches a port.
"""

from amt_station.wire.atoms import RESULT_ATOM, Atom, AtomType
from amt_station.wire.checksum import checksum
from amt_station.wire.decoder import (Acknowledgement, BareDecoder, Decoder, EnvelopeDecoder, Frame,
                                      Item, Skipped, Text)
from amt_station.wire.envelope import (ACKNOWLEDGEMENT, LARGEST_REQUEST, MAGIC, OVERHEAD,
                                       decode_envelope, encode_envelope, encode_request, unwrap,
                                       wrap)
from amt_station.wire.errors import (AtomTypeError, ChecksumError, HeadError, LengthError,
                                     MagicError, MissingAtomError, StrayBytesError, TruncatedError,
                                     ValueRangeError, WireError)
from amt_station.wire.packet import PACKET_SIZE, Packet

__all__ = [
    "ACKNOWLEDGEMENT", "Acknowledgement", "Atom", "AtomType", "AtomTypeError", "BareDecoder",
    "ChecksumError", "Decoder", "EnvelopeDecoder", "Frame", "HeadError", "Item",
    "LARGEST_REQUEST", "LengthError", "MAGIC", "MagicError", "MissingAtomError", "OVERHEAD",
    "PACKET_SIZE", "Packet", "RESULT_ATOM", "Skipped", "StrayBytesError", "Text",
    "TruncatedError", "ValueRangeError", "WireError", "checksum", "decode_envelope",
    "encode_envelope", "encode_request", "unwrap", "wrap",
]
