#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * The wire layout. All numbers are little-endian and not aligned.
 *
 *   packet    0  u16   total length L: header and atoms
 *             2  u8    head, 0xBB
 *             3  u8    command id (amt/amt-command.h)
 *             4  u16   atom length: L - 6
 *             6  ...   atoms, back to back, in the order in which they were added
 *
 *   atom      0  u8    head, 0xEE
 *             1  u8    atom id
 *             2  u8    value type: 1 integer, 2 string, 3 bytes, 4 boolean or single byte
 *             3  u16   value length n: 4 for type 1, 1 for type 4
 *             5  n     value: i32, characters without a terminating zero, bytes, one byte
 *
 *   envelope  0  u32   magic, 0xDDCCBBAA: the bytes AA BB CC DD
 *             4  u32   L + 8: everything behind this field
 *             8  u8    flag A, 2
 *             9  u8    flag B, 0
 *            10  u16   reserved, 0
 *            12  L     packet
 *          12+L  u32   amt_checksum over the 12 + L bytes before it
 *
 * Only frames to and from the PC travel in an envelope (amt/amt-convert.h).
 *
 * Everything here is bytes in, bytes out: no I/O, no state, no lock; a packet belongs to one thread at a
 * time. A packet is always the start of an area of AMT_PACKET_SIZE bytes, which is the caller's. Whatever the
 * lengths inside a packet claim, nothing outside that area is read or written.
 */

constexpr uint8_t AMT_PACKET_HEAD = 0xBB;
constexpr uint32_t AMT_PACKET_HEADER_SIZE = 6;
constexpr uint32_t AMT_PACKET_HEAD_OFFSET = 2;
constexpr uint32_t AMT_PACKET_CMD_OFFSET = 3;
constexpr uint32_t AMT_PACKET_ATOM_LENGTH_OFFSET = 4;

constexpr uint8_t AMT_ATOM_HEAD = 0xEE;
constexpr uint32_t AMT_ATOM_HEADER_SIZE = 5;
constexpr uint32_t AMT_ATOM_ID_OFFSET = 1;
constexpr uint32_t AMT_ATOM_TYPE_OFFSET = 2;
constexpr uint32_t AMT_ATOM_LENGTH_OFFSET = 3;
constexpr uint8_t AMT_ATOM_TYPE_INT = 1;
constexpr uint8_t AMT_ATOM_TYPE_STRING = 2;
constexpr uint8_t AMT_ATOM_TYPE_BYTES = 3;
constexpr uint8_t AMT_ATOM_TYPE_BOOL = 4;
constexpr uint16_t AMT_ATOM_INT_SIZE = 4;
constexpr uint16_t AMT_ATOM_BOOL_SIZE = 1;

constexpr uint32_t AMT_ENVELOPE_MAGIC = 0xDDCCBBAAU;
constexpr uint8_t AMT_ENVELOPE_FLAG_A = 2;
constexpr uint8_t AMT_ENVELOPE_FLAG_B = 0;
constexpr uint32_t AMT_ENVELOPE_LENGTH_OFFSET = 4;
constexpr uint32_t AMT_ENVELOPE_FLAG_OFFSET = 8;
constexpr uint32_t AMT_ENVELOPE_HEAD_SIZE = 12;
constexpr uint32_t AMT_ENVELOPE_CHECKSUM_SIZE = 4;
constexpr uint32_t AMT_ENVELOPE_OVERHEAD = AMT_ENVELOPE_HEAD_SIZE + AMT_ENVELOPE_CHECKSUM_SIZE;

/* What amt_checksum answers when it cannot check what it is given. */
constexpr uint32_t AMT_CHECKSUM_FAILED = 0xFFFFFFFFU;

/* Zeroes size bytes at buf. Nothing happens for an absent buf. */
void amt_packet_clear(void *buf, uint32_t size);

/* Starts an empty packet with the command id and zeroes the rest of the area. Returns the atom length, 0. */
uint16_t amt_packet_init(uint8_t *packet, uint8_t cmd);

/* The command id; 0 for an absent packet. */
uint8_t amt_packet_get_cmd(const uint8_t *packet);

/* The total length in bytes, as the packet claims it; 0 for an absent packet. */
uint16_t amt_packet_get_length(const uint8_t *packet);

/*
 * Where the next atom goes: packet + total length. Requires that the total length is at most AMT_PACKET_SIZE
 * (the adders below check that themselves). Absent for an absent packet.
 */
uint8_t *amt_packet_get_end(uint8_t *packet);

/* Adds n to the total length, which wraps at 16 bits, and returns the new atom length. 0 for an absent
 * packet. */
uint16_t amt_packet_add_length(uint8_t *packet, uint16_t n);

/* Whether an atom with a value of n bytes still fits the area behind the packet's end. False for an absent
 * packet. */
bool amt_packet_has_room(const uint8_t *packet, uint32_t n);

/*
 * The adders append one atom. One that would pass the end of the area is not added: the packet stays as it
 * was. So does an absent packet, text or data.
 */
void amt_packet_add_int(uint8_t *packet, uint8_t atom_id, int32_t value);

/* Appends a single byte, the low byte of value. */
void amt_packet_add_bool(uint8_t *packet, uint8_t atom_id, int32_t value);

/* Appends the characters of text without its terminating zero. */
void amt_packet_add_string(uint8_t *packet, uint8_t atom_id, const char *text);

/* Appends n bytes of data; n may be 0. */
void amt_packet_add_bytes(uint8_t *packet, uint8_t atom_id, const uint8_t *data, uint16_t n);

/*
 * The first atom with this id: returns a pointer to its length field (both bytes are inside the area, the
 * value need not be), or absent. A byte other than 0xEE where an atom should start ends the search.
 */
const uint8_t *amt_packet_find_atom(const uint8_t *packet, uint8_t atom_id);

/*
 * The getters look at the atom's length, never at its type. Value bytes that a length claims behind the end
 * of the area count as zero bytes.
 *
 * Number and switch: the value's bytes replace the low bytes of the default, which is 0 for a number and 1
 * ("on") for a switch; a missing atom gives the default. A value longer than 4 bytes aborts the process.
 */
int32_t amt_packet_get_int(const uint8_t *packet, uint8_t atom_id);
int32_t amt_packet_get_bool(const uint8_t *packet, uint8_t atom_id);

/*
 * Zeroes dst (capacity bytes), copies the first min(n, capacity) bytes of the value of n bytes and returns
 * how many. Returns 0 for a missing atom or an absent dst. Capacity 0 asks for the size: returns n.
 */
uint32_t amt_packet_get_bytes(const uint8_t *packet, uint8_t atom_id, uint8_t *dst, uint32_t capacity);

/*
 * As amt_packet_get_bytes, with two differences: capacity 0 returns n + 1, and a capacity below n copies
 * capacity - 1 bytes, so that dst is terminated. A capacity of exactly n leaves dst without a terminating
 * zero: give dst n + 1 bytes where one is needed.
 */
uint32_t amt_packet_get_string(const uint8_t *packet, uint8_t atom_id, char *dst, uint32_t capacity);

/*
 * The checksum of the envelope over length bytes of data. Not the standard CRC-32: stations expect its
 * reflected table applied most significant bit first, and four zero bytes behind the data. Returns
 * AMT_CHECKSUM_FAILED for absent data with a length, or when data and zeros together are more bytes than 32
 * bits count. Any thread may call it at any time.
 */
uint32_t amt_checksum(const uint8_t *data, uint32_t length);
