#pragma once

#include <stdint.h>

/* Capacity of a packet, and of everything that holds one, in bytes. */
constexpr uint32_t AMT_PACKET_SIZE = 4096;

/* The container in which every request and response travels: always cleared as a whole. */
struct amt_buf_st
{
    uint32_t m_buf_len;               /* valid bytes; 0 in a response: not computed yet */
    uint8_t m_buf_a[AMT_PACKET_SIZE]; /* a packet, or AT text */
};
static_assert(sizeof(amt_buf_st) == 4100);

/* The channel a request came from, and its answer goes to. */
constexpr uint32_t AMT_CHANNEL_PC = 1;
constexpr uint32_t AMT_CHANNEL_APP = 2;
constexpr uint32_t AMT_CHANNEL_NONE = 255; /* always refused */

/*
 * A request handler. Requires: req holds a packet (no envelope) of m_buf_len bytes; rsp is the channel's
 * response buffer, cleared as a whole, which the handler builds its answer in. Both stay the caller's. Returns 0 when it has
 * answered, else a negative code, and the dispatcher decides what the station sees.
 */
using amt_handle_func = int (*)(uint32_t channel, amt_buf_st *req, amt_buf_st *rsp);
