#pragma once

#include <stdint.h>

#include "pub/file/file.h"

/*
 * What fscanf reads, without what it leaves undefined. Blanks and line ends in front are skipped, what
 * follows the word or number is left unread. Each returns 1 with the result stored, 0 when something else
 * stands there, EOF when nothing does or it cannot be read; the output is left alone then, and errno is the
 * failing read's or 0. They require an open file.
 */

/* Reads a word, cut at size - 1 characters. A zero byte ends it as a blank does. */
int pub_file_scan_word(const pub_file_st &file, char *word_ptr, uint32_t size);

/* Reads a decimal number, with or without a sign, as "%ld" does; one that a long does not hold becomes its
 * nearest end. */
int pub_file_scan_long(const pub_file_st &file, long *value_ptr);

/*
 * The same as "%d" and "%u" read it ("%u" takes a sign as well: -1 is 4294967295). fscanf itself leaves a
 * number out of range undefined. Here it is what the platform's C library makes of it: the text is converted
 * as a long (which saturates), and its low 32 bits are the number. So 4294967301 is 5 where a long has 64
 * bits, and 99999999999999999999 is -1 there.
 */
int pub_file_scan_int(const pub_file_st &file, int32_t *value_ptr);
int pub_file_scan_unsigned(const pub_file_st &file, uint32_t *value_ptr);
