#pragma once

#include <stdint.h>
#include <stdio.h>

/*
 * Read one decimal number, as fscanf does with "%d" and "%u": blanks and line ends before it are skipped, a
 * sign is taken ("%u" takes one as well: -1 is 4294967295), and what follows the number does not matter.
 * Return 1 with the number stored, 0 when something else stands there, EOF when nothing does; *value_ptr is
 * left alone then.
 *
 * fscanf itself leaves a number out of range undefined. Here it is what the platform's C library makes of it:
 * the text is converted as a long (which saturates), and its low 32 bits are the number. So 4294967301 is 5
 * where a long has 64 bits, and 99999999999999999999 is -1 there.
 */
int amt_number_scan_int(FILE *stream, int32_t *value_ptr);
int amt_number_scan_unsigned(FILE *stream, uint32_t *value_ptr);
