#pragma once

#include "amt/amt-buf.h"

/*
 * Request 174, operation in atom 140: 0 stops the GPS, 2 checks its connectivity, 1 and every other value
 * start it. 0, -101, -100 or the send's status.
 */
int amt_gps_control(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 176: no hardware action. Acknowledged with 175, the response id of the GPS control. 0, -101 or the
 * send's status. */
int amt_gps_test(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 178: reads the signal of the satellite at the index in atom 141; answers carrier-to-noise value
 * (atom 144) and satellite id (atom 141). 0 whether or not the answer could be sent, -101, -100.
 */
int amt_gps_read_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
