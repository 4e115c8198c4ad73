#pragma once

#include <stdint.h>

/* The switch that permits or forbids USB-inserted starts to enter the test mode: a digit in a file. */

constexpr const char *AMT_PERMISSION_FILE = "/amt/power_usb_amt.txt";

/* Room for the file's first line. */
constexpr uint32_t AMT_PERMISSION_TEXT_SIZE = 100;

/* What may be done with the switch; the first two are also what it says. */
enum class amt_permission_en : int
{
    FORBID = 0,
    PERMIT = 1,
    READ = 2
};

/*
 * Does the operation, a value of amt_permission_en. *flag_ptr gets the number that the file holds afterwards;
 * for READ, 1 when the file cannot be read. Returns 0, PUB_ERR_FAIL (not written) or PUB_ERR_PARAM (any other
 * operation).
 */
int handle_amt_damt1_operation(int operation, int *flag_ptr);

/*
 * Reads the file: its text goes to text_ptr (AMT_PERMISSION_TEXT_SIZE bytes). Returns the number it begins
 * with, or PERMIT when it cannot be read; *is_read_ptr tells which.
 */
int amt_permission_read(char *text_ptr, bool *is_read_ptr);
