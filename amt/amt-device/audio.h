#pragma once

#include "amt/amt-buf.h"

/*
 * Request 33: starts the player program with the configured sound file (atom 15 non-zero or missing), or ends
 * the player that runs (atom 15 = 0). 0, -101, -118 (player or sound file missing, player failed) or the
 * send's status.
 */
int amt_device_audio(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 31: switches the codec's loop of the type in atom 30 on (atom 15 exactly 1 or missing) or off. 0,
 * -101, -118 (audio HAL or its entry missing) or the send's status.
 */
int amt_device_audio_loop(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
