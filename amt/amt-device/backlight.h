#pragma once

#include "amt/amt-buf.h"

/*
 * Request 57: sets the LCD backlight to the level of atom 26 (0 to 255); every other value, taken as
 * unsigned, restores the level found before the first request, or 200 when that one could not be read. A
 * failure to write is silent towards the station: no response, status 0. 0 in every case but the entry check
 * (-101).
 */
int amt_device_lcd_brightness(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 37: writes atom 15 to the button backlight. 0, -101, -118. */
int amt_device_button_backlight(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
