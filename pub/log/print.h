#pragma once

/*
 * Progress text on standard output: formatted and written with one write, past the C library's buffers, so
 * that it reaches a pipe at once and stands even when the process ends by a signal. Texts over 4607 bytes are
 * cut. Preserves errno; may be called from a signal handler.
 */
void pub_print(const char *format, ...) __attribute__((format(printf, 1, 2)));
