#pragma once

#include <stdint.h>

/*
 * Has the driver measure and reads the battery ADC's raw value. Returns 0, or PUB_ERR_FAIL for an absent
 * pointer and when the value cannot be read. When the driver does not take the measuring command, the status
 * is 0 and *value_ptr is left alone: the caller reports what it has set there.
 */
int amt_read_adc(uint32_t *value_ptr);

/*
 * Stores the four calibration values durably in "/amt/vbatt", in the form the driver takes them at boot.
 * Returns 0, or PUB_ERR_FAIL when the file cannot be opened or written.
 */
int amt_write_adc_diff_value(int32_t a, int32_t b, int32_t c, int32_t d);
