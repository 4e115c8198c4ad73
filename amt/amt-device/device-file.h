#pragma once

#include <stdint.h>

/*
 * Kernel files that hold one decimal number. func is the handler whose name the log lines carry, line the
 * line in its source; use the macros.
 */

/*
 * Reads the number at the start of the file. Returns 0, or -118 after the error line and the line of the open
 * or of the reading; *value_ptr is left alone then. A number out of range, or followed by other text, is the
 * number that "%d" takes (see pub/file/scan.h).
 */
int amt_device_file_read_int(int line, const char *func, const char *path, int32_t *value_ptr);

/*
 * Writes the number in decimal, without a line end, in one write. Returns 0, or -118 after the error line and
 * the line of the open or of the writing.
 */
int amt_device_file_write_int(int line, const char *func, const char *path, int32_t value);

#define AMT_DEVICE_READ_INT(path, value_ptr) amt_device_file_read_int(__LINE__, __func__, path, value_ptr)
#define AMT_DEVICE_WRITE_INT(path, value)    amt_device_file_write_int(__LINE__, __func__, path, value)
