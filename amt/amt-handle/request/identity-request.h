#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Handlers (see amt_handle_func) of the identity numbers that stations read and write by packet. A handler
 * that fails sends no response.
 */

/*
 * Id 193: the PCBA number. The first byte of atom 190 is the operation: 1 reads the number into string atom
 * 191 of the response, 2 writes the request's string atom 191, at most 29 characters. Returns the status of
 * the send, PUB_ERR_FAIL (not read or not written) or PUB_ERR_PARAM (bad channel, request or response, or any
 * other operation).
 */
int amt_handle_board_pcba_ctrl(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Id 191: the adb (USB) serial number. Integer atom 160 is the operation: 0 reads the number into string atom
 * 161 of the response, 1 writes the request's string atom 161, cut to the length in integer atom 162 (1 to
 * 99). Returns the status of the send, PUB_ERR_FAIL (not read, not written, or a bad length) or PUB_ERR_PARAM
 * (as above).
 */
int amt_handle_adb_serial_no(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
