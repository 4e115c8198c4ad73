#pragma once

#include "pub/file/file.h"

/*
 * The calibration file of the Wi-Fi chip: the stock text with the stored address of this handset in it.
 */

/* Where the Wi-Fi address is kept: one line. */
constexpr const char *AMT_WIFI_ADDRESS_FILE = "/amt/WIFI/WIFI_nvram.txt";

/*
 * Rewrites the driver's calibration file from the stock one, with the stored address in place of the stock
 * one, and makes it readable and writable for all. Without a stored address the text is copied as it is.
 * Returns 0, or PUB_ERR_FAIL: no stock file, the driver's file cannot be written, the stock text is too long
 * (its copy is cut) or the address file is empty (the copy is complete).
 */
int amt_write_wifi_to_nvram_file();

/*
 * The copy alone. address is the stored address with its line feed; empty: none is stored. A line of more
 * than 98 characters counts as several. Returns 0, or PUB_ERR_FAIL when the copy was cut after its 100th
 * ordinary line or could not be written.
 */
int amt_nvram_copy(const pub_file_st &source, const pub_file_st &destination, const char *address);
