#pragma once

#include <stdint.h>

/*
 * The AT command channel: the modem's AT-mux tty. A tty that was lost (EIO) is reopened once a call, with its
 * unsolicited reports switched off again, without the caller noticing.
 */

/*
 * Writes length bytes of text in one write. Returns 0 (also after a short write), -100, -101 (absent text or
 * length 0), or the error of reopening a lost tty. The log shows the text up to its first zero byte: text
 * must be terminated.
 */
int write_at(const char *text, uint32_t length);

/*
 * Blocks until the modem sends something and reads at most length bytes of it into buf. buf must have a byte
 * more than length, which this call sets to 0 behind the bytes read. *count_ptr gets the bytes read; 0 is
 * possible. Returns 0, -100, -101 (absent argument or length 0), or the error of reopening a lost tty.
 */
int read_at(char *buf, uint32_t length, int32_t *count_ptr);

/*
 * Switches the modem's unsolicited link reports off and waits, without limit, for its final result.
 * Returns 0, -100 (the modem refused), -101 (fd 0 or less), -113 (not writable in 5 s), -118, -119 (short
 * write).
 */
int disable_unsolicited_code(int fd);
