#pragma once

#include <atomic>
#include <pthread.h>

/*
 * A detached worker thread. It is stopped by SIGUSR1, which ends it at once while it waits and at its next
 * wait while it works, so that it never takes a lock with it (pub/util/thread-end.h).
 *
 * However a worker ends (by itself, by a stop, by somebody else's SIGUSR1), nobody may signal it afterwards:
 * the handle of a detached thread that is gone means nothing. Three things see to that:
 *
 * - A key of the thread clears its record. Its destructor runs at every end; one on the thread's stack would
 *   not run at an end by pthread_exit.
 * - One lock guards every record. A start holds it until the handle is stored, a stop while it signals, and
 *   the destructor takes it: so the thread that a stop signals is still there, and a thread that ends at once
 *   is not entered after its end.
 * - A worker begins with SIGUSR1 blocked, until the key and its deferral are set.
 */
struct amt_worker_st
{
    std::atomic<pthread_t> m_id; /* 0 when not running, or when the worker is leaving by itself */
    std::atomic<int> m_is_alive; /* 1 from creation until the thread has ended but for the C library's part */
    void (*m_loop)();
};

/*
 * Creates the thread and runs loop on it, with the thread-signal handler installed and its end deferred.
 * Returns 0 or the error number of pthread_create. worker_ptr must live as long as the process. One thread
 * at a time starts workers.
 */
int amt_worker_start(amt_worker_st *worker_ptr, void (*loop)());

/*
 * Stops the worker, waiting a short bounded time for its end. Nothing happens, and nothing is logged, when it
 * does not run or is the calling thread itself.
 */
void amt_worker_stop(amt_worker_st *worker_ptr);

/*
 * Called by a worker that leaves its loop: clears its id, so that nobody stops it any more. When another
 * thread is just stopping it, this call does not return: the thread ends here.
 */
void amt_worker_leave(amt_worker_st *worker_ptr);
