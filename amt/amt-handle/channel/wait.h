#pragma once

#include <stddef.h>
#include <sys/types.h>

/*
 * The blocking waits of the worker threads on a line: a worker may be ended while it is inside one of these,
 * or in pub_util_sleep_ms, and nowhere else. All leave errno as the wait left it.
 */

/* read(2), taken up again when a signal has interrupted it. */
ssize_t amt_wait_read(int fd, void *buf, size_t size);

/*
 * Waits until fd is readable, has hung up or failed; a signal does not end the wait. Returns 1, 0 after
 * timeout_ms milliseconds, or -1 with errno set.
 */
int amt_wait_readable(int fd, int timeout_ms);

/* Waits until fd is writable, as amt_wait_readable. */
int amt_wait_writable(int fd, int timeout_ms);
