#pragma once

#include <stdint.h>
#include <stdio.h>

/*
 * Reading of small text files by lines of a limited length. A line longer than the limit comes in pieces,
 * each of which counts as a line; only a last piece can lack the line feed.
 */

/* The longest piece, its line feed included, and the room it needs with the terminator. */
constexpr uint32_t AMT_LINE_LENGTH = 98;
constexpr uint32_t AMT_LINE_SIZE = AMT_LINE_LENGTH + 1;

enum class amt_line_step_en : uint8_t
{
    DONE,
    OPEN_FAILED,
    READ_FAILED /* unreadable, or empty: then errno is 0 */
};

/*
 * Reads the next line, its line feed included, into line_ptr (AMT_LINE_SIZE bytes), terminated. Returns its
 * length in bytes, zero bytes within the line included; 0 at the end of the file or after a failed read
 * (errno tells).
 */
uint32_t amt_line_get(FILE *stream, char *line_ptr);

/*
 * Reads the first line of a file into line_ptr (AMT_LINE_SIZE bytes), which is empty when the result is not
 * DONE. errno is then the failing call's.
 */
amt_line_step_en amt_line_file_read(const char *path, char *line_ptr);

/* Copies at most size - 1 characters and terminates them. size is at least 1. */
void amt_line_copy(char *dst, uint32_t size, const char *text);
