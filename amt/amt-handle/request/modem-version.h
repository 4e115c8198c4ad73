#pragma once

#include <stdint.h>

/* Room for the version that the modem gives for one of its modules, in bytes. */
constexpr uint32_t AMT_MODEM_VERSION_SIZE = 410;

/*
 * Asks the modem for the version of module type (17 or 18): version (AMT_MODEM_VERSION_SIZE bytes, zeroed
 * behind the text) gets its bytes, *length_ptr their number, which may be 0. Returns 0;
 * PUB_ERR_PARAM for an empty answer; PUB_ERR_FAIL when it is not well-formed or the modem refused; or the
 * failing status of the AT channel.
 */
int get_l1_hls_version(int32_t type, uint8_t *version, uint32_t *length_ptr);
