#pragma once

#include "amt/amt-buf.h"

/* Request 9: the battery voltage as the kernel gives it, unscaled, in atom 5. 0, -101, -118 or the send's
 * status. */
int amt_device_battery_voltage(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 224: the battery ADC's raw value in atom 151. Request 226: stores the calibration values of atoms
 * 146 to 149 and hands them to the driver. 0, -101, -100 (reading, storing, or another id) or the send's
 * status.
 */
int amt_device_battery_voltage_check(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
