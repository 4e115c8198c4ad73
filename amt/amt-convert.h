#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Between a packet and the other sides: the modem's flat blocks ("AT data"), and the envelope of the PC link
 * (layouts: amt/amt-packet.h). Failures are logged; no partial output is rolled back.
 *
 * A block of a request is the command id, then the bare values of the atoms (little-endian integers). Only
 * the transparent DSP command puts a u16 little-endian length before each value.
 *
 * A block of a response is the command id, a big-endian result code, then what the command's row in
 * amt-convert-rsp.cpp lists: big-endian integers, single bytes, and bytes whose length is little-endian.
 */

/*
 * A request packet (AMT_PACKET_SIZE bytes) becomes a block in out, which is zeroed first (capacity bytes);
 * *out_len gets the block's length in bytes, up to a fault also. All buffers stay the caller's and must not
 * overlap.
 *
 * Returns 0; PUB_ERR_FAIL for a malformed packet, or when its lengths lead outside the packet's area or the
 * block outside out; PUB_ERR_PARAM for an absent argument or capacity 0.
 */
int amt_convert_req_amt_data_2_at_data(const uint8_t *packet, uint8_t *out, uint32_t capacity,
                                       uint32_t *out_len);

/*
 * A modem's block of len bytes becomes a response packet in packet, whose capacity must be AMT_PACKET_SIZE. A
 * block that ends with its result code gives a packet with AMT_ATOM_RESULT only. Fields behind the end of the
 * block read as zero bytes. The buffers stay the caller's and must not overlap.
 *
 * Returns 0; PUB_ERR_FAIL when a value does not fit the packet; PUB_ERR_PARAM for an absent argument, len 0,
 * another capacity, or a value of length 0.
 */
int amt_convert_rsp_at_data_2_amt_data(const uint8_t *block, uint32_t len, uint8_t *packet,
                                       uint32_t capacity);

/*
 * The steps of a response: each reads one field at *cursor, advances *cursor behind it and appends one atom
 * to packet. The caller sees to it that the field's bytes (4, 1, count) exist at *cursor.
 *
 * Return 0, or PUB_ERR_PARAM for an absent argument. The bytes step also returns PUB_ERR_PARAM for count 0,
 * and PUB_ERR_FAIL, with nothing moved or added, when the value does not fit the packet.
 */
int rsp_at_data_2_amt_data_atom_int(const uint8_t **cursor, uint8_t *packet, uint8_t atom_id);
int rsp_at_data_2_amt_data_atom_bool(const uint8_t **cursor, uint8_t *packet, uint8_t atom_id);
int rsp_at_data_2_amt_data_atom_byte(const uint8_t **cursor, uint8_t *packet, uint32_t count,
                                     uint8_t atom_id);

/*
 * Strips the envelope in place: m_buf_len shrinks by 16. Only the magic is looked at: neither the length
 * field nor the flags nor the checksum are verified.
 *
 * Returns 0; PUB_ERR_FAIL when it is no envelope (less than 17 bytes, more than the buffer holds, another
 * magic), buffer unchanged, nothing logged; PUB_ERR_PARAM for an absent buffer or length 0.
 */
int amt_convert_pc_2_app(amt_buf_st *buf_ptr);

/*
 * Wraps the packet in the buffer in place: m_buf_len becomes its length + 16. A length of 0 is taken from the
 * packet.
 *
 * Returns 0; PUB_ERR_PARAM for an absent buffer, an empty packet, or one that leaves no room for the 16 bytes
 * (over 4080 bytes), buffer unchanged.
 */
int amt_convert_app_2_pc(amt_buf_st *buf_ptr);
