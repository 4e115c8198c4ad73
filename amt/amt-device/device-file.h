#pragma once

#include <stdint.h>

#include "amt/amt-log.h"

/* Kernel files that hold one decimal number, whose failures are told from the place, and shell commands. */

/*
 * Reads the number at the start of the file. Returns 0, or PUB_ERR_FILE after the error line and the line of
 * the open or of the reading; *value_ptr is left alone then. A number out of range, or followed by other
 * text, is the number that "%d" takes (see pub/file/scan.h).
 */
int amt_device_file_read_int(const char *path, int32_t *value_ptr,
                             const pub_log_place_st &place = g_amt_device_log);

/*
 * Writes the number in decimal, without a line end, in one write. Returns 0, or PUB_ERR_FILE after the error
 * line and the line of the open or of the writing.
 */
int amt_device_file_write_int(const char *path, int32_t value,
                              const pub_log_place_st &place = g_amt_device_log);

/*
 * Runs a command by the platform's shell and waits for its end, however long it takes; at once again when it
 * fails, five times at most. Logs every failed attempt, or that it succeeded. Returns 0, or PUB_ERR_FAIL after
 * the fifth failure.
 */
int amt_device_do_command(const char *command);
