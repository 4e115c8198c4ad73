#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"
#include "amt/amt-handle/channel/response.h"

/* The start and the end that the modem-backed handlers share. */

/*
 * Logs the entry of the calling handler and checks its arguments, and that there is a modem. Returns 0, -101
 * or -111; use them through the macros.
 */
int amt_request_begin(int line, const char *func, uint32_t channel, const amt_buf_st *req_ptr,
                      const amt_buf_st *rsp_ptr);
int amt_request_begin_modem(int line, const char *func, uint32_t channel, const amt_buf_st *req_ptr,
                            const amt_buf_st *rsp_ptr);
#define AMT_BEGIN_REQUEST(channel, req_ptr, rsp_ptr)                                                         \
    amt_request_begin(__LINE__, __func__, channel, req_ptr, rsp_ptr)
#define AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr)                                                   \
    amt_request_begin_modem(__LINE__, __func__, channel, req_ptr, rsp_ptr)

/* Clears the response buffer as a whole and starts the packet rsp_id in it. */
void amt_reply_start(amt_buf_st *rsp_ptr, uint8_t rsp_id);

/* Appends result 0 to a started packet and sends it. Returns the status of the send. */
int amt_reply_finish_ok(uint32_t channel, amt_buf_st *rsp_ptr);

/* Answers the packet rsp_id with the result of a failed exchange. Returns the status of the send. */
int amt_reply_failed(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id);
