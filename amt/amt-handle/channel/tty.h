#pragma once

#include <atomic>
#include <stdint.h>

/* How long a tty is waited for: attempts, one a second. */
constexpr int32_t AMT_TTY_ATTEMPTS = 60;    /* PC port and modem data tty */
constexpr int32_t AMT_TTY_AT_ATTEMPTS = 30; /* AT-mux tty */

/*
 * Opens the tty read-write and makes it *fd_ptr's. A descriptor that was open keeps its number and gets the
 * new tty once that is there, because other threads read from it; on failure it is left as it is.
 * Returns 0 or the error of pub_util_try_to_open_device.
 */
int amt_tty_open(std::atomic<int> *fd_ptr, const char *path, int32_t attempts);

/* Opens (or reopens) the modem data tty, logs it, and sets its line for packet use when it is a real serial
 * port. */
int amt_tty_open_modem();

/* Opens (or reopens) the AT-mux tty. The modem's unsolicited reports are not touched. */
int amt_tty_open_at();

/* Sets the modem data tty's line speed when it is a real serial port ("/dev/ttyS..."); any other keeps its
 * line. */
void amt_tty_set_modem_speed(int32_t speed);
