#pragma once

#include "amt/amt-buf.h"

/*
 * Request 170: switches the Bluetooth chip on. It takes long, so the service forks: the parent acknowledges
 * at once, the child switches the chip on and acknowledges a second time. BOTH return to the caller, parent
 * and child alike; the caller finishes the request in either, and whoever reads from the line next ends the
 * process that is not the service's own (see service-process.h). 0, -101, -118 or the send's status.
 */
int amt_device_bt(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 172, operation in atom 110: 1 reads the Bluetooth address file into atom 111, 2 writes it from atom
 * 111, 3 checks the hardware. 0, -101 (also for a file that is not there to be read), -118, -100 or the
 * send's status.
 */
int amt_device_bt_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
