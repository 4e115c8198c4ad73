#pragma once

#include <stdint.h>

#include "amt/amt-atom.h"
#include "amt/amt-buf.h"
#include "amt/amt-log.h"

/*
 * A handler's way in and its way out: enter, start the answer, fill it, finish it (or fail). All buffers stay
 * the caller's. Whatever starts an answer clears the buffer as a whole first, so nothing of an earlier answer
 * that could not be sent is left in it.
 */

/* The result (AMT_ATOM_RESULT) that modem-backed handlers answer failures with, and that of the dispatchers. */
constexpr int32_t AMT_RESULT_MODEM_FAILED = 10;
constexpr int32_t AMT_RESULT_NOT_SERVED = 1;

/*
 * The start of every handler: logs the entry line of the calling function and checks what it was called with:
 * channel not AMT_CHANNEL_NONE, request present and not empty, response present. Returns 0, or PUB_ERR_PARAM
 * after the caller's error line and a flag for each of the four.
 */
int amt_reply_enter(const pub_log_place_st &place, uint32_t channel, const amt_buf_st *req_ptr,
                    const amt_buf_st *rsp_ptr);

/* The check alone, for a handler that logs no entry line. */
int amt_reply_check(const pub_log_place_st &place, uint32_t channel, const amt_buf_st *req_ptr,
                    const amt_buf_st *rsp_ptr);

/* As amt_reply_enter, for a handler that needs the modem: PUB_ERR_NO_MODEM when there is none. */
int amt_reply_enter_modem(const pub_log_place_st &place, uint32_t channel, const amt_buf_st *req_ptr,
                          const amt_buf_st *rsp_ptr);

/*
 * Whether the modem's AT device could be opened at start-up: 0, or PUB_ERR_NO_MODEM after the caller's error
 * line and two more. For a handler that does not check its arguments.
 */
int amt_reply_check_modem(const pub_log_place_st &place);

/* Clears the whole response and starts the packet rsp_id in it. */
void amt_reply_start(amt_buf_st *rsp_ptr, uint8_t rsp_id);

/*
 * Wraps the started packet for the PC on AMT_CHANNEL_PC, and sends it. Returns the status of the send, or
 * PUB_ERR_PARAM when the packet does not fit its envelope.
 */
int amt_reply_finish(uint32_t channel, amt_buf_st *rsp_ptr);

/* As amt_reply_finish, with result 0 as the packet's last atom. */
int amt_reply_finish_ok(uint32_t channel, amt_buf_st *rsp_ptr);

/* Answers with the packet rsp_id and AMT_RESULT_MODEM_FAILED. Returns the status of the send. */
int amt_reply_fail(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id);

/*
 * Sends the packet (or text) in rsp_ptr on its channel in one write: the PC port for AMT_CHANNEL_PC, the app's
 * pseudo-terminal otherwise. A length of 0 is taken from the packet's own length field. On success the buffer
 * is cleared, on failure it is left as it is. Returns 0, PUB_ERR_PARAM (bad channel, absent or empty
 * response), PUB_ERR_FAIL (closed descriptor), PUB_ERR_FILE (failed write) or PUB_ERR_INCOMPLETE (short
 * write).
 */
int amt_handle_send_rsp(uint32_t channel, amt_buf_st *rsp_ptr);

/* Builds the packet rsp_id with result 0 in rsp_ptr, wraps it for the PC on AMT_CHANNEL_PC and sends it. */
int amt_handle_send_rsp_ok(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id);

/* As amt_handle_send_rsp_ok, with the given result code. */
int amt_handle_send_rsp_err(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id, int32_t code);

/* Sends the fixed 16-byte acknowledgement frame to the PC. PUB_ERR_PARAM for any other channel or an absent
 * buffer. */
int amt_handle_send_pre_rsp_for_pc(uint32_t channel, amt_buf_st *rsp_ptr);
