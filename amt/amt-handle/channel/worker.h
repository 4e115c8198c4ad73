#pragma once

#include <atomic>
#include <pthread.h>

/*
 * A detached worker thread of the hub. It is stopped by SIGUSR1, which ends it at once while it waits and at
 * its next wait while it works (pub_util_defer_thread_end), so that it never takes a lock with it.
 */
struct amt_worker_st
{
    std::atomic<pthread_t> m_id; /* 0 when not running, or when the worker is leaving by itself */
    std::atomic<int> m_is_alive; /* 1 from creation until the thread has really ended */
    void (*m_loop)();
};

/*
 * Creates the thread and runs loop on it, with the thread-signal handler installed and its end deferred.
 * Returns 0 or the error number of pthread_create. worker_ptr must live as long as the process. Called by the
 * main thread only.
 */
int amt_worker_start(amt_worker_st *worker_ptr, void (*loop)());

/* Stops the worker, waiting a short bounded time for its end. Nothing happens when it does not run. */
void amt_worker_stop(amt_worker_st *worker_ptr);

/*
 * Called by a worker that leaves its loop: clears its id, so that nobody stops it any more. When another
 * thread is just stopping it, this call does not return: the thread ends here.
 */
void amt_worker_leave(amt_worker_st *worker_ptr);
