/*
 * The platform's test HAL. It is loaded when needed, so what is named here are its path and the names and
 * shapes of its entries; they have C linkage.
 */
#pragma once

#include <stdint.h>

#define AMT_MISC_HAL_LIBRARY            "/system/lib/hw/amt.tq5530.misc.so"
#define AMT_MISC_HAL_CREATE_DEVINFO     "create_devinfo"
#define AMT_MISC_HAL_ENTER_IDLE         "enter_idle"
#define AMT_MISC_HAL_USB_CHARGER_ENABLE "amt_usb_charger_enable"
#define AMT_MISC_HAL_CHECK_SANITY       "amt_check_system_sanity"

/*
 * Fills text with the device information, at most capacity characters. The caller owns the buffer, which is
 * one byte larger than the capacity and zeroed, so that a text of full length is terminated as well. 0 for
 * success.
 */
typedef int32_t (*amt_misc_hal_create_devinfo_func)(char *text, int32_t capacity);

/* Puts the handset into idle. 0 for success. */
typedef int32_t (*amt_misc_hal_enter_idle_func)(void);

/* Sets the USB charger's mode (0 or above). 0 for success. */
typedef int32_t (*amt_misc_hal_usb_charger_enable_func)(int32_t mode);

/* Returns the verdict of the system check; it is passed on, not judged. */
typedef int32_t (*amt_misc_hal_check_sanity_func)(void);
