#pragma once

#include <stdint.h>

/*
 * Looks for an identity write in the PC's request and keeps what it writes: it is saved to its file when the
 * modem has accepted it. id is the request's command id, or AMT_ID_NO_PACKET.
 */
void amt_identity_capture(uint32_t id);
