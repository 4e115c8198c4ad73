#pragma once

#include <pthread.h>
#include <stdint.h>

#include "pub/util/signal-table.h"
#include "pub/util/thread-end.h"

/*
 * Process and device utilities. Every operation declared here logs its entry, is re-entrant, and answers with
 * a status of pub/error.h unless it says otherwise. PUB_ERR_PARAM is an absent or invalid argument.
 */

/*
 * Whether the program of the given name runs under the process id that pid_file holds: *is_run_ptr receives 1
 * and *pid_ptr the id when the first word of that process's command line contains name, else both receive 0.
 * A file that is missing, holds no number, or names a process that is gone or is another program means "not
 * running".
 *
 * Returns PUB_ERR_NONE, or PUB_ERR_PARAM when an argument is absent or a text is empty (nothing is stored
 * then).
 */
int pub_util_get_pid_and_check_run(const char *pid_file, const char *name, int32_t *is_run_ptr,
                                   int32_t *pid_ptr);

/*
 * Has the shell write the own process id to "/tmp/NAME.pid". The shell command is cut at 59 characters.
 *
 * Returns PUB_ERR_NONE whatever the shell did, PUB_ERR_PARAM for an absent name.
 */
int pub_util_create_pid_file(const char *name);

/*
 * The first word of a process's command line, that is, its program as it was started, cut at capacity - 1
 * characters. buf (capacity bytes) is zeroed first.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_FILE when it cannot be read, PUB_ERR_PARAM.
 */
int pub_util_get_cmd_line(int32_t pid, char *buf, uint32_t capacity);

/*
 * The directory the own process was started from: its command line's first word up to the last '/', or all of
 * it when it has none. Buffer and statuses as for pub_util_get_cmd_line.
 */
int pub_util_get_process_path(char *buf, uint32_t capacity);

/*
 * Gives the process real-time first-in-first-out scheduling, 4 below the highest priority.
 *
 * Returns PUB_ERR_NONE or PUB_ERR_SYS_CALL.
 */
int pub_util_raise_process_priority();

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

/*
 * Stops the thread *thread_ptr with SIGUSR1, for which it must have pub_util_handle_thread_signal installed;
 * waits 10 ms for its end and clears *thread_ptr to 0. Nothing happens for a handle of 0 or a thread that is
 * gone.
 *
 * Returns PUB_ERR_NONE, the error number of pthread_kill, or PUB_ERR_PARAM for an absent pointer.
 */
int pub_util_kill_thread(pthread_t *thread_ptr);

/*
 * The handler of SIGUSR1 on worker threads: ends the calling thread, at once or where it next allows its end
 * (see pub/util/thread-end.h). Any other signal is only logged.
 */
void pub_util_handle_thread_signal(int signal_number);

/*
 * Size, used and available space in KiB of the file system mounted at mount_point, each cut to 32 bits; used
 * and available are counted as an unprivileged user sees them. An absent output is left out, but one must be
 * there. A file system counts as mounted when a line of /proc/mounts contains mount_point anywhere.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_NOT_FOUND when it is not mounted, PUB_ERR_FILE when it cannot be asked,
 * PUB_ERR_PARAM for an absent or empty mount point or when no output is given.
 */
int pub_util_get_mount_fs_info(const char *mount_point, uint32_t *total_ptr, uint32_t *used_ptr,
                               uint32_t *available_ptr);
