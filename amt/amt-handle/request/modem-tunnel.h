#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * The handler (see amt_handle_func) of every request that the modem itself understands: the packet travels to
 * the modem inside one AT command, and each answer block that comes back before the final result is sent as a
 * packet, one that precedes an error result too. Returns 0 (also when the modem sent no block),
 * PUB_ERR_PARAM (bad argument, channel 0 included), PUB_ERR_NO_MODEM, PUB_ERR_FAIL (request over 2041 bytes
 * in the modem's form, or an error result), or the failing status of the exchange, the conversion or the
 * send.
 */
int amt_modem_handle_req(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
