#pragma once

#include <stdint.h>

/*
 * When a worker thread may be ended by SIGUSR1.
 *
 * A thread that is ended in the middle of a log call or an allocation would take the lock of it along, and
 * whoever shuts the process down would wait for that lock for ever. So a worker defers its end while it works
 * and allows it while it waits. A thread that never calls these is ended wherever the signal finds it.
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

/* A described pause, in milliseconds, during which the thread may be ended. Signals do not shorten it. */
void pub_util_sleep_ms(uint32_t ms);
