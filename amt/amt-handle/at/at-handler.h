#pragma once

/*
 * The handlers of the AT commands, a family a source. operands is the request's text behind the command,
 * terminated; each returns the status of its reply, or PUB_ERR_PARAM, without a reply, when its first operand
 * is missing.
 */

/* at-factory: the handset's factory data. */
int amt_at_read_bt_address(const char *operands);
int amt_at_write_bt_address(const char *operands);
int amt_at_read_wifi_address(const char *operands);
int amt_at_write_wifi_address(const char *operands);
int amt_at_control_pcba(const char *operands);       /* 1: read the board serial number; 2,sn: write it */
int amt_at_control_permission(const char *operands); /* of USB-inserted starts: an amt_permission_en */
int amt_at_test_only(const char *operands);          /* the query whether a command exists: always OK */

/* at-handset: the handset as a whole. */
int amt_at_read_sw_version(const char *operands);
int amt_at_power_off(const char *operands);
int amt_at_enter_idle(const char *operands);
int amt_at_read_boot_dl_fin(const char *operands);
int amt_at_read_emmc_info(const char *operands);

/* at-radio: the platform's radio test library. */
int amt_at_check_device(const char *operands);            /* connectivity of 0: Wi-Fi; 1: GPS; 3: Bluetooth */
int amt_at_control_bt(const char *operands);              /* 0: stop; 1: start */
int amt_at_control_gps(const char *operands);             /* 0: stop; 2,index: start and read one satellite */
int handle_amt_device_wifi_tx_ctrl(const char *operands); /* 0: stop; 1,channel,rate,power: start */
int handle_amt_device_wifi_rx_ctrl(const char *operands); /* 0: stop; 1,channel,rate: start */

/*
 * Replies to AT text on the PC port. Each is sent at once and returns the sender's status
 * (amt_handle_send_rsp).
 */
int amt_at_reply_ok();    /* "OK" */
int amt_at_reply_error(); /* "ERROR": the command failed, or its operand means nothing */
int amt_at_reply_cme();   /* "+CME ERROR: 100": a file or a property could not be read or written */

/*
 * A reply of the given text, cut at 4095 characters: with its line ends, as the station sees it.
 */
int amt_at_reply(const char *format, ...) __attribute__((format(printf, 1, 2)));
