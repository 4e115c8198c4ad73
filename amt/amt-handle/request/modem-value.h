#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Handlers (see amt_handle_func) that read one value of the modem or of the battery driver. Unless stated
 * otherwise: PUB_ERR_PARAM for a bad channel, request or response and PUB_ERR_NO_MODEM without a modem, both
 * without an answer; every later failure is answered with AMT_RESULT_MODEM_FAILED, and the status of that
 * send is returned.
 */

/* Id 85: the board number, at most 38 characters. */
int amt_modem_handle_read_board(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 65: the out-date record, at most 14 characters. */
int amt_modem_handle_read_outdate(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 234: the modem's serial number, as bytes, at most 38. */
int amt_read_serial_number(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 197: whether the modem supports the switch to the factory-test mode. */
int amt_query_amt_support(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 99: whether a SIM is there; the answer has no result atom. */
int amt_dtoc_checkSIM(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Id 55: the battery temperature, in the driver's unit. Needs no modem. */
int amt_modem_handle_temperature(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Selects the modem channel that later AT commands address: AMT_ATOM_MODEM_CHANNEL of the request. Answers on
 * success only (id 233). Returns the status of the send, PUB_ERR_NO_MODEM, PUB_ERR_FAIL when the modem's
 * single answer holds no "OK", or the failing status of the channel. Requires req_ptr and rsp_ptr to be
 * present.
 */
int amt_channel_switch(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Id 232 from the app: hands on to amt_channel_switch and returns its status. Any other id is answered with 0
 * and nothing is sent. PUB_ERR_PARAM for bad arguments.
 */
int amt_at_to_modem(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
