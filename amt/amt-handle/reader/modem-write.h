#pragma once

/*
 * Writes the held PC request to the modem data tty, unchanged, in one write. A lost tty (EIO, EBADF) is
 * reopened; the request is not written again. Returns 0, -100 (short or failed write), or the error of the
 * reopening.
 */
int amt_modem_write_request();
