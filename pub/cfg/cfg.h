#pragma once

#include <stdint.h>
#include <stdio.h>

/*
 * Readers for line-based text: one line at a time, and a line split into key and value. They log nothing
 * about what they read; a file may be full of lines that are nobody's business.
 */

/*
 * Reads one line of the stream into buf. The whole of buf (capacity bytes) is zeroed first; the line's LF is
 * not stored, nor are CRs at its end, and what does not fit is read and dropped. A line that fills buf leaves
 * no terminator, so a caller that treats buf as text keeps one more zero byte behind the capacity.
 *
 * length_ptr receives the length of the stored text up to its first zero byte; is_eof_ptr receives 1 when the
 * input ended with this line (which may hold text), else 0.
 *
 * Returns PUB_ERR_NONE, or PUB_ERR_PARAM when a pointer is absent.
 */
int pub_cfg_get_line(FILE *stream, char *buf, uint32_t capacity, uint32_t *length_ptr, int *is_eof_ptr);

/*
 * Splits "key = value" in place: the first '=' ends the key, blanks (the space character only) around both
 * are removed. key_ptr and value_ptr receive pointers into line; either text may be empty.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_NOT_FOUND for a comment (first character after blanks is '#') or a line
 * without '=', PUB_ERR_PARAM when a pointer is absent; with an error the outputs are left alone.
 */
int pub_cfg_get_param_and_value(char *line, char **key_ptr, char **value_ptr);
