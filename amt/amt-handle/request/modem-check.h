#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Handlers (see amt_handle_func) that ask the modem for one value and check it. All return -101 for a bad
 * channel, request or response and -111 without a modem, both without an answer; every other failure is
 * answered with result 10, and the status of that send is returned.
 */

/* Id 197: whether the modem supports the switch to the factory-test mode. */
int amt_query_amt_support(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 234: the modem's serial number, as bytes. */
int amt_read_serial_number(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 99: whether a SIM is there; the answer has no result atom. */
int amt_dtoc_checkSIM(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
