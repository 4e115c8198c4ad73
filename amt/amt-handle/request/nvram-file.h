#pragma once

#include <stdio.h>

/*
 * The calibration file of the Wi-Fi chip: the stock text with the stored address of this handset in it.
 */

/* Where the Wi-Fi address is kept: one line. */
constexpr const char *AMT_WIFI_ADDRESS_FILE = "/amt/WIFI/WIFI_nvram.txt";

/*
 * Rewrites the driver's calibration file from the stock one, with the stored address in place of the stock
 * one, and makes it readable and writable for all. Without a stored address the text is copied as it is.
 * Returns 0, or -100: no stock file, the driver's file cannot be written, the stock text is too long (its
 * copy is cut) or the address file is empty (the copy is complete).
 */
int amt_write_wifi_to_nvram_file();

/*
 * The copy alone. address is the stored address with its line feed; empty: none is stored. Lines are those of
 * line-file.h. Both streams stay the caller's. Returns 0, or -100 when the copy was cut after its 100th
 * ordinary line.
 */
int amt_nvram_copy(FILE *source, FILE *destination, const char *address);
