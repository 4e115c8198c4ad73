#pragma once

/*
 * AT commands on the handset's factory data. operands is the request's text behind the command, terminated;
 * each returns the status of its reply, or -101 when operands are missing, without a reply.
 */
int amt_at_read_bt_address(const char *operands);
int amt_at_write_bt_address(const char *operands);
int amt_at_read_wifi_address(const char *operands);
int amt_at_write_wifi_address(const char *operands);

/* 1: read the board serial number; 2,sn: write it. */
int amt_at_control_pcba(const char *operands);

/* The permission for USB-inserted starts. 0: forbid; 1: permit; 2: read. */
int amt_at_control_permission(const char *operands);

/* The query whether a command exists: always OK. */
int amt_at_test_only(const char *operands);
