#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Entries of the platform's test HAL, which is loaded for each call and unloaded after it. They return -118
 * when the library or the entry is missing.
 */

/* Puts the handset into idle. Returns the HAL's answer (0 for success) or -118. */
int amt_make_ue_enter_idle();

/* Sets the USB charger's mode. Returns the HAL's answer (0 for success), -101 for a negative mode, or -118.
 */
int amt_usb_charge_ctrl(int32_t mode);

/*
 * Stores the HAL's verdict of the system check, which tells whether the boot download was finished, in
 * *verdict_ptr (0 first). Returns 0 when the check was made, whatever its verdict, or -118.
 */
int amt_boot_dl_fin_read(int32_t *verdict_ptr);

/* Request 238: the HAL's device information text (at most 4055 characters) in atom 200. 0, -101, -118, the
 * HAL's answer or the send's status. */
int amt_read_dev_info(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 240: puts the handset into idle. 0, -101, or the status of amt_make_ue_enter_idle or of the send.
 */
int amt_enter_idle(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Request 246: the eMMC information text in atom 205. 0, -101, -100 or the send's status. */
int amt_device_emmc_info(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
