#pragma once

#include <stdint.h>

/*
 * What the PC reader has captured of a station's identity write until the modem reader sees the modem's
 * answer to it: the two texts, the modem channel they belong to, and which of them is pending. Every
 * operation may be called from any thread. Requires that a worker's end is deferred while it is in here, as
 * it is wherever a worker works.
 */

/* What an identity write is about; the values of kind below. */
constexpr int AMT_IDENTITY_NONE = 0;
constexpr int AMT_IDENTITY_IMEI = 1;
constexpr int AMT_IDENTITY_SN = 2; /* the serial number, or the text of a board write */

/* Room for a captured text: 20 characters and the terminator. */
constexpr uint32_t AMT_IDENTITY_TEXT_SIZE = 21;

/* Empties both texts, selects channel 0 and drops a pending write. */
void amt_identity_reset();

/*
 * Replaces the text of AMT_IDENTITY_IMEI or AMT_IDENTITY_SN; any other kind changes nothing. Of text the
 * first length characters are taken, at most 20, and none behind a zero byte. An absent text empties the
 * slot.
 */
void amt_identity_set_text(int kind, const char *text, uint32_t length);

/* Copies the text of the kind, terminated, to out (AMT_IDENTITY_TEXT_SIZE bytes); an empty text for any other
 * kind. */
void amt_identity_get_text(int kind, char *out);

/* The modem channel of identity writes: 1 is the second modem channel, every other value the first. */
void amt_identity_set_channel(uint8_t channel);
uint8_t amt_identity_get_channel();

/* The write that waits for the modem's answer (AMT_IDENTITY_NONE: none). */
void amt_identity_set_pending(int kind);
int amt_identity_get_pending();
