#pragma once

#include <stdint.h>

#include "amt/amt-handle/request/nvram-file.h"
#include "amt/amt-log.h"

/*
 * The handset's identity, kept as small text files under "/amt": IMEI and serial number of each modem
 * channel, the PCBA number, the radio addresses. Every writer truncates its file, writes, closes it and
 * flushes the file system, which takes 100 ms of pauses. Failures are logged with the failing call's errno,
 * which is also left in errno.
 */

/* Room for a PCBA number: 29 characters and the terminator. */
constexpr uint32_t AMT_PCBA_SN_SIZE = 30;

/* Room for a Wi-Fi address: 59 characters and the terminator. */
constexpr uint32_t AMT_WIFI_ADDRESS_SIZE = 60;

/* The serial number of the second modem channel and the PCBA number share this file. */
constexpr const char *AMT_PCBA_SN_FILE = "/amt/sn-2.txt";

/* Where the Bluetooth address is kept, and where get_bt_addr_file looks first. */
constexpr const char *AMT_BT_ADDRESS_FILE = "/amt/BT/BT_Address.txt";

/*
 * Writes a text without a line end to the file: the common writer of the PCBA number, the IMEI and the serial
 * number. Returns 0, PUB_ERR_PARAM (absent or empty text) or PUB_ERR_FILE (open or write failed; a failed
 * write leaves the file truncated).
 */
int amt_write_pcba_sn(const char *text, const char *path);

/*
 * Reads the PCBA number, terminated, into buf (AMT_PCBA_SN_SIZE bytes). Returns 0 or PUB_ERR_FILE; buf is
 * empty then.
 */
int amt_read_pcba_sn(char *buf);

/*
 * Reads the first line of a file, at most 98 characters with its line feed kept, into buf (size bytes),
 * terminated and cut to size - 1. Returns 0, PUB_ERR_PARAM (absent buffer, size 0 or absent path) or
 * PUB_ERR_FILE (not opened, not read or empty; buf is empty then).
 */
int amt_read_data_from_file(char *buf, uint32_t size, const char *path);

/* The path of the Bluetooth address file that exists, static text; null when there is none. */
const char *get_bt_addr_file();

/*
 * Makes the folder if nothing of that name exists, and gives it to the group "radio" with mode 766: written
 * by all, searched by its owner only. Returns 0, PUB_ERR_PARAM (absent path) or PUB_ERR_FILE (it cannot be
 * made).
 */
int amt_make_folder(const char *path);

/*
 * Reads the first line of a file into buf (size bytes), terminated, less its last character, which is the line
 * feed; the log calls its length length_name. Returns 0, or PUB_ERR_FAIL with buf empty, after the two lines of
 * the failure. The place's function has its entry line here.
 */
int amt_read_cut_line(const char *path, char *buf, uint32_t size, const char *length_name,
                      const pub_log_place_st &place = g_amt_handle_log);

/*
 * Reads the Wi-Fi address into buf (AMT_WIFI_ADDRESS_SIZE bytes), less the last character of its line, which
 * is the line feed. Returns 0 or PUB_ERR_FAIL; buf is empty then.
 */
int amt_read_wifi_address(char *buf);

/* Writes the Wi-Fi address and a line feed. Returns 0, PUB_ERR_FAIL (not opened), PUB_ERR_PARAM (absent or
 * empty) or PUB_ERR_FILE. */
int amt_write_wifi_address(const char *text);
