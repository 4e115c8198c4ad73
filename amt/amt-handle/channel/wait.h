#pragma once

#include <stddef.h>
#include <sys/types.h>

/*
 * The blocking waits of the worker threads: a worker may be ended while it is inside one of these, and
 * nowhere else. All leave errno as the wait left it.
 */

/* read(2), taken up again when a signal has interrupted it. */
ssize_t amt_wait_read(int fd, void *buf, size_t size);

/*
 * Waits until fd is readable; a signal does not end the wait. Returns what select(2) returns: 1, 0 after
 * timeout_ms milliseconds, or -1.
 */
int amt_wait_readable(int fd, int timeout_ms);

/* Waits until fd is writable, as amt_wait_readable. */
int amt_wait_writable(int fd, int timeout_ms);
