#pragma once

#include <stdint.h>

/* Room for the software version text: 254 characters and a byte for a terminator, which get_ap_sw_version
 * leaves out. */
constexpr uint32_t AMT_AP_VERSION_SIZE = 255;

/* Room for one line of the eMMC information or the carrier name. */
constexpr uint32_t AMT_AP_LINE_SIZE = 50;

/*
 * Builds the software version text of the application side from the system properties and factory files: buf
 * (AMT_AP_VERSION_SIZE bytes) gets at most 254 characters without a terminator, *length_ptr their number.
 * Returns 0; PUB_ERR_PARAM (absent argument); PUB_ERR_FAIL (a property the text starts with cannot be read:
 * buf untouched, length 0); or the status of reading the board information, the text being complete all the
 * same.
 */
int get_ap_sw_version(char *buf, uint32_t *length_ptr);

/*
 * Reads the first line of the eMMC information, at most 48 characters, into buf (AMT_AP_LINE_SIZE bytes),
 * terminated; the line's last character, which is the line feed, is dropped. Returns 0 or PUB_ERR_FAIL.
 */
int amt_read_emmc_info(char *buf);

/* Reads the carrier name into buf (AMT_AP_LINE_SIZE bytes), terminated. Returns 0 or PUB_ERR_FAIL. */
int amt_read_cm_info(char *buf);
