#pragma once

#include "amt/amt-buf.h"

/*
 * The GPS requests. Each is a handler as amt-buf.h has it: bad arguments are PUB_ERR_PARAM after the error
 * line and the four flags, and a handler that fails has sent nothing. Further statuses are named with each;
 * the status of the send is one where nothing else is said.
 */

/*
 * Request 174, operation in atom 140: 0 stops the GPS, 2 checks its connectivity, 1 and every other value
 * start it. PUB_ERR_FAIL when the library fails.
 */
int amt_gps_control(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 176: no hardware action. Acknowledged with 175, the response id of the GPS control. */
int amt_gps_test(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 178: reads the signal of the satellite at the index in atom 141; answers carrier-to-noise value
 * (atom 144) and satellite id (atom 141). PUB_ERR_FAIL when the library fails; otherwise 0, whether or not
 * the answer could be sent, or the status of its envelope.
 */
int amt_gps_read_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
