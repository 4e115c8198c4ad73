#pragma once

#include <stdint.h>

/*
 * Processes: the pid file, the own program and its priority, shell commands. Every operation logs its entry
 * and answers with a status of pub/error.h unless it says otherwise; PUB_ERR_PARAM is an absent or invalid
 * argument.
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
 * Gives the process real-time first-in-first-out scheduling, 4 below the highest priority: its first thread
 * and the calling one, with all that this one creates from then on.
 *
 * Returns PUB_ERR_NONE or PUB_ERR_SYS_CALL.
 */
int pub_util_raise_process_priority();

/*
 * Runs a shell command and waits for its end, however long it takes. Logs nothing. The command starts with
 * the calling thread's signal mask and with the default disposition of every signal that this process does
 * not ignore.
 *
 * The C library ignores SIGINT and SIGQUIT in the whole process meanwhile. SIGINT is not lost by that while
 * the main thread has it blocked and takes it with sigtimedwait: an ignored signal that is blocked stays
 * pending, and one that is pending already is let through before the command begins.
 *
 * Returns what system(3) returns, and errno as it leaves it.
 */
int pub_util_run_shell(const char *command);
