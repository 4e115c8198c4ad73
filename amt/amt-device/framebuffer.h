#pragma once

#include <stdint.h>

#include "amt/amt-device/picture.h"

/*
 * The screen through the kernel's framebuffer. One thread uses it, so nothing here is locked.
 */

/* Switches the text console to graphics mode, so that it stops drawing. A handset without one is fine. */
void amt_framebuffer_silence_console();

/*
 * Opens the framebuffer, reads what it is like and maps its memory. A mapping too small for the page that
 * would be shown next counts as a failed one. Returns 0, or -1 after one log line with everything closed
 * again. One that is open already is closed first.
 */
int amt_framebuffer_open();

/* Unmaps and closes it, if it is open. */
void amt_framebuffer_close();

/* Draws the picture (AMT_PICTURE_SIZE bytes) on the page that is not visible and makes it visible. 0 or -1.
 */
int amt_framebuffer_show(const uint8_t *pixel);
