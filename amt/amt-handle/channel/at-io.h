#pragma once

#include <stdint.h>

/*
 * The AT command channel: the modem's AT-mux tty. A tty that was lost (EIO) is reopened once a call, with its
 * unsolicited reports switched off again, without the caller noticing.
 */

/*
 * Writes length bytes of text in one write. Returns 0 (also after a short write), PUB_ERR_FAIL, PUB_ERR_PARAM
 * (absent text or length 0), or the error of reopening a lost tty. The log shows the text up to its first zero byte: text
 * must be terminated.
 */
int write_at(const char *text, uint32_t length);

/*
 * Blocks until the modem sends something and reads at most length bytes of it into buf. buf must have a byte
 * more than length, which this call sets to 0 behind the bytes read. *count_ptr gets the bytes read: a read of
 * 0 bytes is a good one of nothing, unless the line says that it has hung up, which counts as EIO. Returns 0,
 * PUB_ERR_FAIL (also when the read after a reopening brings nothing), PUB_ERR_PARAM (absent argument or length
 * 0), or the error of reopening a lost tty.
 */
int read_at(char *buf, uint32_t length, int32_t *count_ptr);

/*
 * Switches the modem's unsolicited link reports off and waits, without limit, for its final result. Returns 0,
 * PUB_ERR_FAIL (the modem refused), PUB_ERR_PARAM (fd 0 or less), PUB_ERR_TIMEOUT (not writable in 5 s),
 * PUB_ERR_FILE (a failed call, or the line was lost while the modem was silent) or PUB_ERR_INCOMPLETE (short
 * write).
 */
int disable_unsolicited_code(int fd);

/*
 * Opens the AT-mux tty, anew when it was open, and switches the modem's unsolicited reports off. A modem that
 * refuses is none the less open; a line that hangs up meanwhile is opened again, up to AMT_TTY_AT_ATTEMPTS
 * times. Returns 0, PUB_ERR_FILE when every line hung up, or the error of pub_util_try_to_open_device.
 */
int amt_at_open();
