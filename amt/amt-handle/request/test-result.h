#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Handlers (see amt_handle_func) of the test stations' verdicts: those the modem keeps, mirrored in a factory
 * file, and those of the on-device items, kept in a file alone. All but the PC's return PUB_ERR_PARAM for a
 * bad channel, request or response without an answer; every later failure is answered with
 * AMT_RESULT_MODEM_FAILED, and the status of that send is returned.
 */

/* Id 91 from the app: stores a station's verdict in the modem. PUB_ERR_NO_MODEM without one, unanswered. */
int amt_modem_write_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 89: reads a station's verdict from the modem. PUB_ERR_NO_MODEM without one, unanswered. */
int amt_modem_read_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Id 91 from the PC: mirrors the verdict and returns PUB_ERR_NOT_FOUND always, so that the request goes on to
 * the modem. Requires req_ptr to be present.
 */
int amt_modem_write_pc_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 230: stores the verdict of an on-device item, at station number - 1. Needs no modem. */
int amt_item_write_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 228: reads the verdict of an on-device item, at the station number itself. Needs no modem. */
int amt_item_read_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
