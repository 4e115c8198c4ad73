"""The codec against bytes written down by hand, and against itself."""

from __future__ import annotations

import pytest
from hypothesis import given
from hypothesis import strategies as st

from amt_station.wire import (ACKNOWLEDGEMENT, LARGEST_REQUEST, PACKET_SIZE, Atom, AtomType,
                              AtomTypeError, ChecksumError, HeadError, LengthError, MagicError,
                              MissingAtomError, Packet, TruncatedError, ValueRangeError, WireError,
                              checksum, decode_envelope, encode_envelope, encode_request, unwrap,
                              wrap)
from amt_station.wire.envelope import check_envelope_packet


def hexed(text: str) -> bytes:
    return bytes.fromhex(text)


EMPTY = hexed("06 00 BB 0A 00 00")
EMPTY_ENVELOPE = hexed("AA BB CC DD 0E 00 00 00 02 00 00 00 06 00 BB 0A 00 00 F9 A4 AB 02")

atoms = st.one_of(
    st.builds(Atom.integer, st.integers(0, 255), st.integers(-2**31, 2**31 - 1)),
    st.builds(Atom.string, st.integers(0, 255), st.text(max_size=40)),
    st.builds(Atom.raw, st.integers(0, 255), st.binary(max_size=40)),
    st.builds(Atom.boolean, st.integers(0, 255), st.integers(0, 255)))
packets = st.builds(Packet, st.integers(0, 255), st.lists(atoms, max_size=6).map(tuple))


@pytest.mark.parametrize("packet, expected", [
    (Packet(0x0A), "06 00 BB 0A 00 00"),
    (Packet(0x0A, (Atom.integer(5, 0x01020304),)),
     "0F 00 BB 0A 09 00 EE 05 01 04 00 04 03 02 01"),
    (Packet(0x0A, (Atom.integer(5, -2),)), "0F 00 BB 0A 09 00 EE 05 01 04 00 FE FF FF FF"),
    (Packet(1, (Atom.string(38, ""),)), "0B 00 BB 01 05 00 EE 26 02 00 00"),
    (Packet(1, (Atom.string(38, "AB"),)), "0D 00 BB 01 07 00 EE 26 02 02 00 41 42"),
    (Packet(1, (Atom.raw(154, b"\x06"),)), "0C 00 BB 01 06 00 EE 9A 03 01 00 06"),
    (Packet(1, (Atom.boolean(15, 255),)), "0C 00 BB 01 06 00 EE 0F 04 01 00 FF"),
    (Packet(0xBB, (Atom.boolean(0xEE, 0xEE),)), "0C 00 BB BB 06 00 EE EE 04 01 00 EE"),
])
def test_packet_bytes(packet: Packet, expected: str) -> None:
    assert packet.encode() == hexed(expected)
    assert Packet.decode(hexed(expected)) == packet


@pytest.mark.parametrize("data, expected", [
    (b"", 0), (b"\x01", 0x77073096), (EMPTY_ENVELOPE[:-4], 0x02ABA4F9),
    (ACKNOWLEDGEMENT[:-4], 0x1DEE4A76)])
def test_checksum(data: bytes, expected: int) -> None:
    assert checksum(data) == expected


def test_envelope_bytes() -> None:
    assert encode_envelope(Packet(10)) == EMPTY_ENVELOPE
    assert decode_envelope(EMPTY_ENVELOPE) == Packet(10)
    assert unwrap(wrap(EMPTY)) == EMPTY


def test_values_of_atoms() -> None:
    packet = Packet(1, (Atom.integer(1, -5), Atom.string(2, "grün"), Atom.raw(3, b"\0\1"),
                        Atom.boolean(4, 7), Atom.integer(2, 9)))
    assert [atom.value for atom in packet.atoms] == [-5, "grün", b"\0\1", 7, 9]
    assert packet.find(2) == Atom.string(2, "grün"), "the first of two atoms counts"
    assert (packet.get_int(1), packet.get_int(4), packet.get_int(2, 0), packet.get_int(99, 0)) == (
        -5, 7, 0, 0)
    for missing in (2, 99):
        with pytest.raises(MissingAtomError, match=f"no number in an atom {missing}"):
            packet.get_int(missing)
    assert packet.result == -5
    assert Packet(1).result is None


def test_a_string_survives_bytes_that_are_no_text() -> None:
    raw = hexed("0C 00 BB 01 06 00 EE 26 02 01 00 FF")
    packet = Packet.decode(raw)
    assert isinstance(packet.atoms[0].value, str)
    assert Packet(1, (Atom.string(38, packet.atoms[0].value),)).encode() == raw


@pytest.mark.parametrize("text, error, words", [
    ("", TruncatedError, "no room for its header"),
    ("06 00 BB 0A 00", TruncatedError, "no room for its header"),
    ("06 00 BA 0A 00 00", HeadError, "0xBA instead of 0xBB"),
    ("05 00 BB 0A FF FF", LengthError, "cannot be 5 bytes"),
    ("01 10 BB 0A FB 0F", LengthError, "cannot be 4097 bytes"),
    ("06 00 BB 0A 01 00", LengthError, "atom length is 1"),
    ("07 00 BB 0A 01 00", TruncatedError, "announces 7 bytes, 6 are there"),
    ("06 00 BB 0A 00 00 00", LengthError, "1 bytes follow"),
    ("0B 00 BB 0A 05 00 ED 05 02 00 00", HeadError, "atom at byte 6 begins with 0xED"),
    ("0A 00 BB 0A 04 00 EE 05 02 00", TruncatedError, "no room for its header"),
    ("0B 00 BB 0A 05 00 EE 05 02 01 00", TruncatedError, "announces 1 bytes, 0 are left"),
    ("0B 00 BB 0A 05 00 EE 05 05 00 00", AtomTypeError, "unknown value type 5"),
    ("0B 00 BB 0A 05 00 EE 05 00 00 00", AtomTypeError, "unknown value type 0"),
    ("0D 00 BB 0A 07 00 EE 05 01 02 00 00 00", AtomTypeError, "2 bytes instead of 4"),
    ("0D 00 BB 0A 07 00 EE 05 04 02 00 00 00", AtomTypeError, "2 bytes instead of 1"),
])
def test_what_is_wrong_with_a_packet(text: str, error: type[WireError], words: str) -> None:
    with pytest.raises(error, match=words):
        Packet.decode(hexed(text))


def changed(position: int, value: int) -> bytes:
    data = bytearray(EMPTY_ENVELOPE)
    data[position] = value
    return bytes(data)


@pytest.mark.parametrize("data, error, words", [
    (EMPTY_ENVELOPE[:7], TruncatedError, "no room for its length"),
    (changed(0, 0xAB), MagicError, "AB BB CC DD"),
    (changed(4, 0x0D), LengthError, "length field 13"),
    (changed(6, 0x01), LengthError, "length field 65550"),
    (EMPTY_ENVELOPE[:-1], TruncatedError, "announces 22 bytes, 21 are there"),
    (EMPTY_ENVELOPE + b"\0", LengthError, "1 bytes follow"),
    (changed(21, 0x03), ChecksumError, "0x03ABA4F9 instead of 0x02ABA4F9"),
    (changed(15, 0x0B), ChecksumError, "instead of"),
    (ACKNOWLEDGEMENT, LengthError, "no packet"),
])
def test_what_is_wrong_with_a_frame(data: bytes, error: type[WireError], words: str) -> None:
    with pytest.raises(error, match=words):
        decode_envelope(data)


def test_frame_and_packet_must_agree_on_the_length() -> None:
    with pytest.raises(LengthError, match="packet of 6 bytes in a frame for 7"):
        check_envelope_packet(wrap(EMPTY + b"\0"))


@pytest.mark.parametrize("make", [
    lambda: Atom.integer(1, 2**31), lambda: Atom.integer(1, -2**31 - 1),
    lambda: Atom.boolean(1, 256), lambda: Atom.boolean(1, -1), lambda: Atom.integer(256, 0),
    lambda: Atom.raw(1, bytes(65536)), lambda: Packet(256), lambda: Packet(-1)])
def test_values_that_do_not_fit(make: type) -> None:
    with pytest.raises(ValueRangeError):
        make()


def test_a_packet_has_4096_bytes_at_most() -> None:
    assert len(Packet(1, (Atom.raw(1, bytes(PACKET_SIZE - 11)),)).encode()) == PACKET_SIZE
    with pytest.raises(ValueRangeError, match="4097"):
        Packet(1, (Atom.raw(1, bytes(PACKET_SIZE - 10)),)).encode()


@pytest.mark.parametrize("enveloped, overhead", [(True, 16), (False, 0)])
def test_a_request_fits_the_buffer_of_the_handset(enveloped: bool, overhead: int) -> None:
    room = LARGEST_REQUEST - overhead - 11
    assert len(encode_request(Packet(1, (Atom.raw(1, bytes(room)),)), enveloped)) == 4095
    with pytest.raises(ValueRangeError, match="4095"):
        encode_request(Packet(1, (Atom.raw(1, bytes(room + 1)),)), enveloped)


def test_atom_type_names() -> None:
    assert [kind.label for kind in AtomType] == ["int", "str", "bytes", "bool"]


@given(packets)
def test_what_is_encoded_is_decoded(packet: Packet) -> None:
    assert Packet.decode(packet.encode()) == packet
    assert decode_envelope(encode_envelope(packet)) == packet


@given(st.binary(max_size=60))
def test_any_bytes_decode_or_say_why_not(data: bytes) -> None:
    try:
        packet = Packet.decode(data)
    except WireError as error:
        assert str(error)
    else:
        assert packet.encode() == data
