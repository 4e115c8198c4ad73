"""The incremental decoders: whatever the pieces and whatever the damage, nothing valid is lost."""

from __future__ import annotations

from itertools import groupby
from typing import Callable, Iterable, Sequence

import pytest
from hypothesis import given
from hypothesis import strategies as st

from amt_station.wire import (ACKNOWLEDGEMENT, Acknowledgement, Atom, BareDecoder, ChecksumError,
                              Decoder, EnvelopeDecoder, Frame, Item, LengthError, Packet, Skipped,
                              StrayBytesError, Text, TruncatedError, encode_envelope)
from amt_station.wire.envelope import MAGIC, wrap

PACKET = Packet(45, (Atom.integer(19, 16), Atom.string(37, "AT\r\nOK"), Atom.raw(4, MAGIC)))
OTHER = Packet(170)
FRAME, OTHER_FRAME = encode_envelope(PACKET), encode_envelope(OTHER)

frames = st.builds(
    lambda command, value, text, raw: Packet(
        command, (Atom.integer(1, value), Atom.string(2, text), Atom.raw(3, raw))),
    st.integers(0, 255), st.integers(-2**31, 2**31 - 1), st.text(max_size=12),
    st.binary(max_size=12))
text_runs = st.text(st.characters(min_codepoint=32, max_codepoint=0x2FF,
                                  blacklist_categories=("Cs", "Cc")), min_size=1, max_size=12)
chunks = st.one_of(
    frames.map(encode_envelope), st.just(ACKNOWLEDGEMENT), text_runs.map(str.encode),
    st.binary(min_size=1, max_size=12), st.just(MAGIC), st.just(MAGIC[:3]),
    st.tuples(frames.map(encode_envelope), st.integers(1, 30)).map(lambda pair: pair[0][:pair[1]]))


def decode(decoder: Decoder, pieces: Iterable[bytes]) -> list[Item]:
    items = [item for piece in pieces for item in decoder.feed(piece)]
    return items + decoder.give_up()


def merged(items: Sequence[Item]) -> list[tuple[str, object]]:
    """Items with runs of the same kind joined, as a run may come in pieces."""
    def key(item: Item) -> tuple[str, str]:
        return type(item).__name__, str(getattr(item, "error", ""))
    return [(str(kind), b"".join(item.raw for item in group)) for kind, group
            in groupby(items, key)]


def cut(stream: bytes, places: Iterable[int]) -> list[bytes]:
    edges = [0, *sorted(min(place, len(stream)) for place in places), len(stream)]
    return [stream[start:end] for start, end in zip(edges, edges[1:])]


def packets_in(items: Iterable[Item]) -> list[Packet]:
    return [item.packet for item in items if isinstance(item, Frame)]


def test_frames_acknowledgements_and_text_in_one_read() -> None:
    items = EnvelopeDecoder().feed(ACKNOWLEDGEMENT + FRAME + b"\r\nOK\r\n" + OTHER_FRAME)
    assert items == [Acknowledgement(), Frame(PACKET, FRAME), Text(b"\r\nOK\r\n"),
                     Frame(OTHER, OTHER_FRAME)]


def test_every_single_byte_split_gives_the_same() -> None:
    stream = b"\r\nOK\r\n" + ACKNOWLEDGEMENT + FRAME + "é".encode() + OTHER_FRAME + b"bye"
    whole = merged(decode(EnvelopeDecoder(), [stream]))
    assert merged(decode(EnvelopeDecoder(), [bytes([byte]) for byte in stream])) == whole
    assert [kind for kind, _ in whole] == [
        "('Text', '')", "('Acknowledgement', '')", "('Frame', '')", "('Text', '')",
        "('Frame', '')", "('Text', '')"]


@pytest.mark.parametrize("text", ["ê ", "\u20aa\u00bb!", "\U0001f4aa."])
def test_a_character_that_looks_like_the_beginning_of_a_frame(text: str) -> None:
    stream = text.encode()
    for place in range(len(stream)):
        assert merged(decode(EnvelopeDecoder(), cut(stream, [place]))) == [
            ("('Text', '')", stream)]


@given(st.lists(chunks, max_size=8), st.lists(st.integers(0, 400), max_size=12))
def test_items_do_not_depend_on_the_pieces(parts: list[bytes], places: list[int]) -> None:
    stream = b"".join(parts)
    whole = decode(EnvelopeDecoder(), [stream])
    assert merged(decode(EnvelopeDecoder(), cut(stream, places))) == merged(whole)
    assert b"".join(item.raw for item in whole) == stream, "every byte comes out once"


@given(st.lists(st.tuples(frames, st.binary(max_size=15)), max_size=5),
       st.lists(st.integers(0, 400), max_size=8))
def test_no_frame_behind_garbage_is_lost(parts: list[tuple[Packet, bytes]],
                                         places: list[int]) -> None:
    # Garbage that ends like the beginning of a frame would truly swallow the next one's head.
    stream = b"".join(garbage.replace(b"\xAA", b"\xAB") + encode_envelope(packet)
                      for packet, garbage in parts)
    items = decode(EnvelopeDecoder(), cut(stream, places))
    assert packets_in(items) == [packet for packet, _ in parts]


@pytest.mark.parametrize("position", range(len(FRAME)))
@pytest.mark.parametrize("flip", [0x01, 0x80, 0xFF])
def test_a_damaged_byte_costs_one_frame_only(position: int, flip: int) -> None:
    damaged = bytearray(FRAME)
    damaged[position] ^= flip
    items = decode(EnvelopeDecoder(), [bytes(damaged) + OTHER_FRAME + ACKNOWLEDGEMENT])
    assert packets_in(items) == [OTHER]
    assert Acknowledgement() in items
    assert any(isinstance(item, Skipped) for item in items)


@pytest.mark.parametrize("size", range(1, len(FRAME)))
def test_a_truncated_frame_costs_one_frame_only(size: int) -> None:
    items = decode(EnvelopeDecoder(), [FRAME[:size] + OTHER_FRAME])
    assert packets_in(items) == [OTHER]


def test_text_in_the_middle_of_a_frame_costs_that_frame_only() -> None:
    items = decode(EnvelopeDecoder(), [FRAME[:25] + b"AT\r" + FRAME[25:] + OTHER_FRAME])
    assert packets_in(items) == [OTHER]


def test_reasons_for_what_was_skipped() -> None:
    bad_checksum = FRAME[:-1] + bytes([FRAME[-1] ^ 1])
    bad_length = MAGIC + b"\xff\xff\xff\xff"
    items = decode(EnvelopeDecoder(), [bad_checksum + b"text" + bad_length + b"\0" + FRAME[:21]])
    reasons = [type(item.error) for item in items if isinstance(item, Skipped)]
    assert reasons == [ChecksumError, LengthError, StrayBytesError, TruncatedError,
                       StrayBytesError]
    assert items[0] == Skipped(bad_checksum, items[0].error)  # type: ignore[union-attr]
    assert items[1] == Text(b"text")


def test_a_frame_whose_packet_is_malformed_is_skipped_whole() -> None:
    frame = wrap(bytes.fromhex("0B 00 BB 0A 05 00 ED 05 02 00 00"))
    items = EnvelopeDecoder().feed(frame + OTHER_FRAME)
    assert [type(item) for item in items] == [Skipped, Frame]
    assert items[0].raw == frame


def test_a_wrong_header_is_noticed_before_the_frame_is_complete() -> None:
    decoder = EnvelopeDecoder()
    long_head = MAGIC + bytes.fromhex("00 10 00 00 02 00 00 00 06 00 BB 0A 00 00")
    assert packets_in(decoder.feed(long_head + OTHER_FRAME)) == [OTHER]


def test_an_incomplete_frame_is_waited_for_until_given_up() -> None:
    decoder = EnvelopeDecoder()
    assert decoder.feed(FRAME[:-1]) == []
    assert decoder.pending == len(FRAME) - 1
    assert decoder.feed(FRAME[-1:]) == [Frame(PACKET, FRAME)]
    assert decoder.pending == 0
    decoder.feed(FRAME[:20])
    items = decoder.give_up()
    assert isinstance(items[0], Skipped) and isinstance(items[0].error, TruncatedError)
    assert decoder.pending == 0
    assert decoder.feed(b"AT") == [Text(b"AT")]


damage = st.lists(st.tuples(st.sampled_from(["change", "lose", "add"]), st.integers(0, 400),
                            st.integers(1, 255)), min_size=1, max_size=4)


def damaged(stream: bytes, faults: Iterable[tuple[str, int, int]]) -> bytes:
    """A stream as a bad line carries it."""
    data = bytearray(stream)
    for fault, place, value in faults:
        place %= len(data) or 1
        if fault == "add":
            data.insert(place, value)
        elif data and fault == "lose":
            del data[place]
        elif data:
            data[place] ^= value
    return bytes(data)


@given(st.sampled_from([(EnvelopeDecoder, encode_envelope), (BareDecoder, Packet.encode)]),
       st.lists(frames, min_size=1, max_size=4), damage, st.lists(st.integers(0, 400), max_size=8))
def test_a_damaged_line_loses_no_byte_and_makes_up_no_frame(
        how: tuple[type[Decoder], Callable[[Packet], bytes]], sent: list[Packet],
        faults: list[tuple[str, int, int]], places: list[int]) -> None:
    decoder, encode = how
    stream = damaged(b"".join(map(encode, sent)), faults)
    items = decode(decoder(), cut(stream, places))
    assert b"".join(item.raw for item in items) == stream
    for frame in (item for item in items if isinstance(item, Frame)):
        assert encode(frame.packet) == frame.raw
        # Only an envelope has a checksum, which no few bytes of damage get past.
        assert decoder is BareDecoder or frame.packet in sent


@given(st.lists(st.one_of(frames.map(Packet.encode), st.binary(min_size=1, max_size=12)),
                max_size=8), st.lists(st.integers(0, 400), max_size=12))
def test_bare_items_do_not_depend_on_the_pieces(parts: list[bytes], places: list[int]) -> None:
    stream = b"".join(parts)
    whole = decode(BareDecoder(), [stream])
    assert merged(decode(BareDecoder(), cut(stream, places))) == merged(whole)
    assert b"".join(item.raw for item in whole) == stream


@pytest.mark.parametrize("garbage", [b"", b"\0", b"\xBB", b"\xBB\xBB\xBB", b"AT\r", b"\x06\x00",
                                     b"\xff" * 7, PACKET.encode()[:-3]])
def test_bare_packets_behind_garbage(garbage: bytes) -> None:
    stream = PACKET.encode() + garbage + OTHER.encode() + OTHER.encode()
    found = packets_in(decode(BareDecoder(), cut(stream, range(len(stream)))))
    assert found[0] == PACKET
    assert found[-1] == OTHER
