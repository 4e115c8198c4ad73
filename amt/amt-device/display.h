#pragma once

#include "amt/amt-buf.h"

/* Request 29: only acknowledged; what is shown is the test app's business. 0, -101 or the send's status. */
int amt_device_lcd_color(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
