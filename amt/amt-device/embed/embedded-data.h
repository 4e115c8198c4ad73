#pragma once

#include <stdint.h>

/* Data files that the daemon carries as constants; the build makes a source of each. */

/* handshake-picture.png of this folder: its pixels, in the form that picture.h names, as a gzip member. */
extern const uint8_t g_handshake_picture_a[];
extern const uint32_t g_handshake_picture_length;

/*
 * The text of scripts/wifi-radio-test.sh, which does the Wi-Fi radio tests from a shell with the chip's own
 * tool, ended by a zero byte. No request writes or runs it: the image carries it for those who look for it
 * there.
 */
extern const char g_wifi_radio_test_script_a[];
