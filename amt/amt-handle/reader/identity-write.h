#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * A station's identity write: the PC reader captures what a request for the modem writes, the modem reader
 * sees the modem accept it, and then the value goes to its factory file. One write is pending at a time, the
 * last one captured. Every operation may be called from any thread.
 */

/* Drops a pending write and selects modem channel 0. */
void amt_identity_reset();

/*
 * Looks for an identity write in the PC's held request, AT text first (anywhere in it), then the packet
 * without its envelope; a switch of the modem channel is noted as well. id is the request's command id, or
 * AMT_ID_NO_PACKET.
 */
void amt_identity_capture(uint32_t id);

/*
 * Looks into what the modem has said for its answer to the pending write, and saves the captured value when
 * the modem has accepted it, which takes 100 ms; an empty value is not written. Any other answer leaves the
 * write pending. The buffer stays as it is.
 */
void amt_identity_complete(const amt_buf_st *modem_ptr);
