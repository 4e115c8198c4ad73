#pragma once

#include <stdint.h>

/*
 * The operands of AT command text. None reaches past its line or the held data, and a CR or LF is never part
 * of one.
 */

/* What handle_amt_get_at_para copies at most, in bytes. */
constexpr uint32_t AMT_AT_PARA_SIZE = 20;

/*
 * The parameter behind prefix in the held request: leading blanks skipped, up to the first carriage return of
 * the whole request (so it is empty when a line precedes the command), at most AMT_AT_PARA_SIZE bytes, no
 * terminator added. Returns 0, PUB_ERR_FAIL when the request does not hold the prefix, or PUB_ERR_PARAM for
 * an absent argument.
 */
int handle_amt_get_at_para(const char *prefix, char *out, uint32_t *length_ptr);

/* A line's operands, separated by ",". */
struct amt_at_operands_st
{
    char m_text_a[4096];
    char *m_next_ptr; /* strtok_r's place in m_text_a */
    bool m_is_started;
};

/* Takes a copy of text up to its line end. */
void amt_at_operands_init(amt_at_operands_st *operands_ptr, const char *text);

/* The next operand, which lives in the record, or null when there is none. Empty operands are skipped. */
const char *amt_at_operands_next(amt_at_operands_st *operands_ptr);

/*
 * Copies a quoted value: text (just behind the opening quote) up to the next quote or the line end, at most
 * capacity - 1 characters, terminated.
 */
void amt_at_copy_quoted(const char *text, char *out, uint32_t capacity);
