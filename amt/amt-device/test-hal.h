#pragma once

#include <stdint.h>

/*
 * Entries of the platform's test HAL, which is loaded for each call and unloaded after it. They return
 * PUB_ERR_FILE when the library or the entry is missing.
 */

/* Puts the handset into idle. Returns the HAL's answer (0 for success) or PUB_ERR_FILE. */
int amt_make_ue_enter_idle();

/*
 * Sets the USB charger's mode. Returns the HAL's answer (0 for success), PUB_ERR_PARAM for a negative mode, or
 * PUB_ERR_FILE.
 */
int amt_usb_charge_ctrl(int32_t mode);

/*
 * Stores the HAL's verdict of the system check, which tells whether the boot download was finished, in
 * *verdict_ptr (0 first). Returns 0 when the check was made, whatever its verdict, or PUB_ERR_FILE.
 */
int amt_boot_dl_fin_read(int32_t *verdict_ptr);
