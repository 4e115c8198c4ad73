"""The frame checksum of the PC line.

It takes the reflected table of the CRC-32 polynomial but applies it most significant bit first,
over the data and four zero bytes, from a zero start and without a final inversion. Ready-made
CRC-32 routines give other values.
"""

from __future__ import annotations

_POLYNOMIAL = 0xEDB88320


def _table_entry(index: int) -> int:
    value = index
    for _ in range(8):
        value = (value >> 1) ^ _POLYNOMIAL if value & 1 else value >> 1
    return value


TABLE = tuple(_table_entry(index) for index in range(256))


def checksum(data: bytes) -> int:
    """The 32-bit checksum of ``data``."""
    table = TABLE
    crc = 0
    for byte in bytes(data) + b"\0\0\0\0":
        crc = ((crc << 8 | byte) & 0xFFFFFFFF) ^ table[crc >> 24]
    return crc
