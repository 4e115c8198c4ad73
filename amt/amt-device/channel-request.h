#pragma once

#include "amt/amt-buf.h"

/*
 * Request 232 through the app channel: hands on to the switch of the modem's channel and returns its status.
 * Any other id is answered with 0 and nothing is sent. -101 for bad arguments.
 */
int amt_at_to_modem(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
