#pragma once

#include <stdint.h>

#include "amt/amt-atom.h"
#include "amt/amt-buf.h"
#include "amt/amt-log.h"

/* The result code (atom 1) that modem-backed handlers answer failures with, and that of the dispatchers. */
constexpr int32_t AMT_RESULT_MODEM_FAILED = 10;
constexpr int32_t AMT_RESULT_NOT_SERVED = 1;

/*
 * Sends the packet (or text) in rsp_ptr on its channel in one write: the PC port for channel 1, the app
 * pseudo-terminal otherwise. A length of 0 is taken from the packet's own length field. On success the buffer
 * is cleared, on failure it is left as it is. Returns 0, -100 (closed descriptor), -101 (bad channel, absent
 * or empty response), -118 or -119 (short write).
 */
int amt_handle_send_rsp(uint32_t channel, amt_buf_st *rsp_ptr);

/* Builds the packet rsp_id with result 0 in rsp_ptr, wraps it for the PC on channel 1 and sends it. */
int amt_handle_send_rsp_ok(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id);

/* As amt_handle_send_rsp_ok, with the given result code. */
int amt_handle_send_rsp_err(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id, int32_t code);

/* Sends the fixed 16-byte acknowledgement frame to the PC. -101 for any other channel or an absent buffer. */
int amt_handle_send_pre_rsp_for_pc(uint32_t channel, amt_buf_st *rsp_ptr);

/*
 * The end of every handler that builds its own packet: wraps it for the PC on channel 1, then sends it.
 * Returns the status of the send, or -101 when the packet does not fit its envelope.
 */
int amt_handle_finish_rsp(uint32_t channel, amt_buf_st *rsp_ptr);

/*
 * The start of every handler: channel not 255, request present and not empty, response present. Otherwise
 * logs the error line of the calling function and the four flags, and returns -101. Use it through
 * AMT_CHECK_REQUEST.
 */
int amt_handle_check_request(const pub_log_source_st &source, int line, const char *func, uint32_t channel,
                             const amt_buf_st *req_ptr, const amt_buf_st *rsp_ptr);
#define AMT_CHECK_REQUEST(source, channel, req_ptr, rsp_ptr)                                                 \
    amt_handle_check_request(source, __LINE__, __func__, channel, req_ptr, rsp_ptr)

/* 0, or -111 after the two log lines when the modem's AT device could not be opened at start-up. */
int amt_handle_check_modem();
