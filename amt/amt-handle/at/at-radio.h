#pragma once

/*
 * AT commands that drive the platform's radio test library. operands is the request's text behind the
 * command, terminated; each returns the status of its reply, or -101 when the first operand is missing,
 * without a reply.
 */

/* 0: Wi-Fi; 1: GPS; 3: Bluetooth connectivity check. */
int amt_at_check_device(const char *operands);

/* 0: stop; 1: start Bluetooth. */
int amt_at_control_bt(const char *operands);

/* 0: stop; 2,index: start and read one satellite. */
int amt_at_control_gps(const char *operands);

/* Transmit test. 0: stop; 1,channel,rate,power: start. */
int handle_amt_device_wifi_tx_ctrl(const char *operands);

/* Receive test. 0: stop; 1,channel,rate: start. */
int handle_amt_device_wifi_rx_ctrl(const char *operands);
