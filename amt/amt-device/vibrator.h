#pragma once

#include "amt/amt-buf.h"

/* Request 35: runs the vibrator for 3 s (atom 15 non-zero or missing) or stops it (atom 15 = 0). 0, -101,
 * -118. */
int amt_device_vibrator(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
