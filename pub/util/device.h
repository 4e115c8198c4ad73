#pragma once

#include <stdint.h>

/*
 * Device nodes and serial lines. Every operation logs its entry and answers with a status of pub/error.h;
 * PUB_ERR_PARAM is an absent or invalid argument.
 */

/*
 * Opens a device node with the given flags (without O_CREAT), trying so many times (at least once), with a
 * pause in milliseconds after every failure, the last one too; a worker thread may be ended in the pause. The
 * descriptor is not inherited by programs the process starts, and a terminal does not become its controlling
 * terminal.
 *
 * Returns PUB_ERR_NONE with *fd_ptr set to a descriptor above 0, which the caller closes; PUB_ERR_FILE after
 * the last attempt or PUB_ERR_PARAM for an absent argument or an empty path, with *fd_ptr left alone.
 */
int pub_util_try_to_open_device(int *fd_ptr, const char *path, int flags, int32_t attempts, int32_t pause_ms);

/*
 * Makes a serial line raw with hardware flow control, at the lowest of 115200, 230400, 460800 and 921600 bits
 * a second that reaches the given speed (921600 when none does). Character size, parity, stop bits and read
 * timing stay.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_SYS_CALL when the attributes cannot be read or written, PUB_ERR_PARAM for a
 * negative descriptor.
 */
int pub_util_set_serial_dev_attr(int fd, int32_t speed);

/*
 * Switches a descriptor to non-blocking (non-zero) or blocking (0) mode.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_FILE, or PUB_ERR_PARAM for a negative descriptor.
 */
int pub_util_set_fd_mode(int fd, int is_nonblock);
