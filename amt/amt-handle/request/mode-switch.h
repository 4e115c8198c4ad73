#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Handlers (see amt_handle_func) of the requests that switch the handset between its normal and its
 * factory-test mode, or off. Unless stated otherwise: PUB_ERR_PARAM for a bad channel, request or response
 * and PUB_ERR_NO_MODEM without a modem, both without an answer; every other failure is answered with
 * AMT_RESULT_MODEM_FAILED, and the status of that send is returned.
 */

/*
 * Id 195: addresses modem channel 0, sets the wanted mode in the modem, turns the serial function of the USB
 * port on, stops the sibling service and ends the daemon with SIGTERM half a second after its answer. Returns
 * the status of the answer if the signal has not ended the process by then.
 */
int amt_handle_normal_to_amt(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Addresses the modem channel of that number. Returns 0 or the failing status of the exchange; answers
 * nothing. */
int amt_change_band(int32_t band);

/* Id 219 from the app: writes (0, 1) or reads (2) the permission to enter the test mode by handshake. */
int amt_handle_damt1_cmd(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Id 219 from the PC: withdraws that permission. Needs no modem and accepts an empty request. Returns
 * PUB_ERR_PARAM or the failing status of the file operation without an answer.
 */
int amt_handle_not_permit_handshake(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Id 236 from the PC: answers, then powers the handset off. Needs no modem and accepts an empty request.
 * Returns the status of the answer if the system refuses to power off.
 */
int amt_handle_power_off(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Powers the handset off: a pause of 2 seconds, in which the answer that announced it reaches the station,
 * then the reboot system call with its power-off command. Returns only when the system refuses, which is
 * logged.
 */
void amt_power_off_handset();
