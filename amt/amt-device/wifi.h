#pragma once

#include "amt/amt-buf.h"

/*
 * Request 185, operation in atom 152: 0 reads the Wi-Fi address into atom 153, 1 writes it from atom 153, 2
 * checks the connectivity. 0, -101 (another operation), -100 or the send's status.
 */
int amt_device_wifi_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 187, sub-command in atom 154 (echoed): 1 and 2 switch the chip's test mode on and off, 3 and 4
 * start and stop a transmission, 5 and 6 a reception, whose packet count goes out in atom 158. Channel, rate
 * and power come in atoms 155, 156 and 157 in the library's units. 0, -101 (another sub-command), -100 or the
 * send's status.
 */
int amt_device_wifi_rtx_test(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * The text of scripts/wifi-radio-test.sh, which does the same tests from a shell with the chip's own tool,
 * ended by a zero byte. No request writes or runs it: the image carries it for those who look for it there.
 */
extern const char g_wifi_radio_test_script_a[];
