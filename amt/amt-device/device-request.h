#pragma once

#include "amt/amt-buf.h"

/*
 * The requests that exercise the handset's own hardware, in the order of their ids. Each is a handler as
 * amt-buf.h has it: bad arguments are PUB_ERR_PARAM after the error line and the four flags, and a handler
 * that fails has sent nothing. Further statuses are named with each; the status of the send is always one.
 */

/* Request 9: the battery voltage as the kernel gives it, unscaled, in atom 5. PUB_ERR_FILE. */
int amt_device_battery_voltage(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 29: only acknowledged; what is shown is the test app's business. */
int amt_device_lcd_color(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 31: switches the codec's loop of the type in atom 30 on (atom 15 exactly 1 or missing) or off.
 * PUB_ERR_FILE without the codec's library or its entry.
 */
int amt_device_audio_loop(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 33: starts the player program with the configured sound file (atom 15 non-zero or missing), or ends
 * the player that runs (atom 15 = 0). PUB_ERR_FILE when the player or the sound file is missing, or the
 * player failed.
 */
int amt_device_audio(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 35: runs the vibrator for 3 s (atom 15 non-zero or missing) or stops it (atom 15 = 0). PUB_ERR_FILE.
 */
int amt_device_vibrator(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 37: writes atom 15 to the button backlight. PUB_ERR_FILE. */
int amt_device_button_backlight(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 57: sets the LCD backlight to the level of atom 26 (0 to 255); every other value, taken as
 * unsigned, restores the level found before the first request, or 200 when it could not be read. Failures are
 * silent towards the station: nothing is sent and the status is 0.
 */
int amt_device_lcd_brightness(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 137: the total size of the external memory card in KiB in atom 55; 0 without a card. Which mount
 * point is the external one is the handset's storage setting.
 */
int amt_device_tf_card(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Requests 139 (main camera) and 147 (second camera): selects the preview. PUB_ERR_FAIL. */
int amt_device_camera(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 170: switches the Bluetooth chip on for testing, which takes seconds, in a child process. The
 * service acknowledges at once and returns; the child switches the chip on and acknowledges a second time,
 * or returns PUB_ERR_FILE, as the service does when there is no child to be had. BOTH return to the caller,
 * parent and child alike; the caller finishes the request in either, and whoever reads from the line next
 * ends the process that is not the service's own (see process-end.h).
 */
int amt_device_bt(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 172, operation in atom 110: 1 reads the Bluetooth address file into atom 111, 2 writes it from atom
 * 111, 3 checks the hardware. PUB_ERR_PARAM also for another operation, an address that is none, and a file
 * that is not there to be read; PUB_ERR_FILE, PUB_ERR_FAIL.
 */
int amt_device_bt_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 180: camera self-test, control id 1 or 2 in atom 112; the driver's verdict goes out in atom 113, 3
 * when the camera lacks the tested input. PUB_ERR_FAIL for another control id or when the device fails.
 */
int amt_device_camera_control(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 185, operation in atom 152: 0 reads the Wi-Fi address into atom 153, 1 writes it from atom 153, 2
 * checks the connectivity. PUB_ERR_PARAM also for another operation; PUB_ERR_FAIL.
 */
int amt_device_wifi_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 187, sub-command in atom 154 (echoed): 1 and 2 switch the chip's test mode on and off, 3 and 4
 * start and stop a transmission, 5 and 6 a reception, whose packet count goes out in atom 158. Channel, rate
 * and power come in atoms 155, 156 and 157 in the library's units. PUB_ERR_PARAM also for another
 * sub-command; PUB_ERR_FAIL.
 */
int amt_device_wifi_rtx_test(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 224: the battery ADC's raw value in atom 151. Request 226: stores the calibration values of atoms
 * 146 to 149 and hands them to the driver. PUB_ERR_FAIL, also for another id.
 */
int amt_device_battery_voltage_check(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 238: the test HAL's device information text, at most 4055 characters, in atom 200. PUB_ERR_FILE
 * without the HAL, else its answer when that is not 0.
 */
int amt_read_dev_info(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 240: puts the handset into idle. The status of amt_make_ue_enter_idle when that is not 0. */
int amt_enter_idle(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * Request 244 from the PC: whether the boot download has finished, as the test HAL tells, in atom 204. Bad
 * arguments are not looked for: req_ptr and rsp_ptr have to be there. PUB_ERR_FAIL without the HAL.
 */
int amt_modem_boot_dl_fin_read(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 246: the eMMC information text in atom 205. PUB_ERR_FAIL. */
int amt_device_emmc_info(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
