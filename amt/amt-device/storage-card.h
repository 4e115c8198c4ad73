#pragma once

#include "amt/amt-buf.h"

/*
 * Request 137: the total size of the external memory card in KiB in atom 55; 0 without a card. Which mount
 * point is the external one is the handset's storage setting. 0, -101 or the send's status.
 */
int amt_device_tf_card(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
