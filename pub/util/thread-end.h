#pragma once

#include <pthread.h>
#include <stdint.h>

/*
 * When a thread may be ended by SIGUSR1, and the waits in which it may.
 *
 * A thread that is ended in the middle of a log call or an allocation would take the lock of it along, and
 * whoever shuts the process down would wait for that lock for ever. So a worker defers its end while it works
 * and allows it while it waits. A thread that never calls these is ended wherever the signal finds it.
 *
 * What a thread has said here is one record of its own, which the first of these calls makes: a worker makes
 * one of them before a signal can reach it, so that no handler has to allocate.
 */

/* From here on the signal only leaves a note. */
void pub_util_defer_thread_end();

/* From here on the signal ends the thread; a note left before ends it now, and this call does not return. */
void pub_util_allow_thread_end();

/*
 * From here on, for ever, the signal does nothing on this thread: it is ending the process itself, or is the
 * main thread. Deferring and allowing have no effect any more.
 */
void pub_util_forbid_thread_end();

/* Whether this thread is working, that is, may hold locks a signal handler must not wait for. */
bool pub_util_is_thread_end_deferred();

/*
 * A pause of ms milliseconds on the monotonic clock, during which the thread may be ended. Signals do not
 * shorten it. Leaves errno and the deferral as they were.
 */
void pub_util_sleep_ms(uint32_t ms);

/*
 * Waits until poll(2) has something to say about fd (the given events, a hang-up or an error), at most
 * timeout_ms milliseconds on the monotonic clock. The thread may be ended meanwhile; a signal that does not
 * end it does not end the wait either.
 *
 * Returns 1, 0 after the time, or -1 with errno set (EBADF for a descriptor that is not open).
 */
int pub_util_wait_fd(int fd, short events, uint32_t timeout_ms);

/*
 * Stops the thread *thread_ptr with SIGUSR1, for which it must have pub_util_handle_thread_signal installed;
 * waits 10 ms for its end and clears *thread_ptr to 0. Nothing happens for a handle of 0 or a thread that is
 * gone. The calling thread is not ended during this call.
 *
 * Returns PUB_ERR_NONE, the error number of pthread_kill, or PUB_ERR_PARAM for an absent pointer.
 */
int pub_util_kill_thread(pthread_t *thread_ptr);

/*
 * The handler of SIGUSR1 on worker threads: ends the calling thread, at once or where it next allows its end.
 * Any other signal is only logged.
 */
void pub_util_handle_thread_signal(int signal_number);
