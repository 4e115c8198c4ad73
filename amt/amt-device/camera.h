#pragma once

#include "amt/amt-buf.h"

/* Requests 139 (main camera) and 147 (second camera): selects the preview. 0, -101, -100 or the send's
 * status. */
int amt_device_camera(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 180: camera self-test, control id 1 or 2 in atom 112; the driver's verdict goes out in atom 113, 3
 * when the camera lacks the tested input. 0, -101, -100 (another control id, device failed) or the send's
 * status.
 */
int amt_device_camera_control(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
