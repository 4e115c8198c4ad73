#include "pub/util/thread-end.h"

#include <algorithm>
#include <errno.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include "pub/error.h"
#include "pub/pub-log.h"

namespace {

constexpr uint32_t END_WAIT_MS = 10;
constexpr int64_t NS_PER_MS = 1000000;
constexpr int64_t NS_PER_SECOND = 1000000000;

/*
 * Each thread's own, so that a handler on that thread is the only one that interferes. One record: where
 * thread-local storage is emulated, the first touch allocates, and it is the same for all of it.
 */
struct end_state_st
{
    volatile sig_atomic_t m_is_deferred;
    volatile sig_atomic_t m_is_forbidden;
    volatile sig_atomic_t m_is_noted;
};
thread_local end_state_st t_end;

pthread_once_t g_unwinder_once = PTHREAD_ONCE_INIT;

void *end_at_once(void *)
{
    pthread_exit(nullptr);
}

/*
 * The first pthread_exit of a process loads the unwinder, which allocates and takes the loader's locks. A
 * thread that does nothing else does it, so that no signal handler has to.
 */
void load_unwinder()
{
    pthread_t thread = 0;
    if (pthread_create(&thread, nullptr, end_at_once, nullptr) == 0) {
        pthread_join(thread, nullptr);
    }
}

/* The monotonic clock, in nanoseconds. */
int64_t get_now()
{
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return int64_t{now.tv_sec} * NS_PER_SECOND + now.tv_nsec;
}

int64_t get_deadline(uint32_t ms)
{
    return get_now() + ms * NS_PER_MS;
}

/* What poll says of the descriptor, or of none, until the time is over. */
int poll_until(int64_t deadline, pollfd *fd_ptr)
{
    for (;;) {
        const int64_t left = std::max<int64_t>(deadline - get_now(), 0);
        const timespec time = {static_cast<time_t>(left / NS_PER_SECOND),
                               static_cast<long>(left % NS_PER_SECOND)};
        const int ready = ppoll(fd_ptr, fd_ptr != nullptr ? 1 : 0, &time, nullptr);
        if (ready >= 0 || errno != EINTR) {
            return ready;
        }
    }
}

/* The same, with the thread's end allowed. */
int poll_open_to_end(int64_t deadline, pollfd *fd_ptr)
{
    const bool was_deferred = pub_util_is_thread_end_deferred();
    pub_util_allow_thread_end();
    const int ready = poll_until(deadline, fd_ptr);
    if (was_deferred) {
        pub_util_defer_thread_end();
    }
    return ready;
}

} // namespace

void pub_util_defer_thread_end()
{
    const int saved_errno = errno;
    pthread_once(&g_unwinder_once, load_unwinder);
    errno = saved_errno;
    if (t_end.m_is_forbidden == 0) {
        t_end.m_is_deferred = 1;
    }
}

void pub_util_allow_thread_end()
{
    if (t_end.m_is_forbidden != 0) {
        return;
    }
    t_end.m_is_deferred = 0;
    if (t_end.m_is_noted != 0) {
        pub_util_handle_thread_signal(SIGUSR1);
    }
}

void pub_util_forbid_thread_end()
{
    t_end.m_is_forbidden = 1;
}

bool pub_util_is_thread_end_deferred()
{
    return t_end.m_is_deferred != 0;
}

void pub_util_sleep_ms(uint32_t ms)
{
    const int saved_errno = errno;
    poll_open_to_end(get_deadline(ms), nullptr);
    errno = saved_errno;
}

int pub_util_wait_fd(int fd, short events, uint32_t timeout_ms)
{
    /* poll takes a negative descriptor for none at all. */
    pollfd poll_fd = {fd, events, 0};
    const int ready = fd < 0 ? 1 : poll_open_to_end(get_deadline(timeout_ms), &poll_fd);
    if (fd < 0 || (ready > 0 && (poll_fd.revents & POLLNVAL) != 0)) {
        errno = EBADF;
        return -1;
    }
    return ready;
}

int pub_util_kill_thread(pthread_t *thread_ptr)
{
    pub_log_entry(g_pub_util_log);
    if (thread_ptr == nullptr) {
        return pub_log_bad_param(g_pub_util_log, {true});
    }
    if (*thread_ptr == 0 || pthread_kill(*thread_ptr, 0) == ESRCH) {
        return PUB_ERR_NONE;
    }
    const int error_number = pthread_kill(*thread_ptr, SIGUSR1);
    if (error_number != 0) {
        errno = error_number; /* the call only returns it */
        pub_log_error(g_pub_util_log, PUB_ERR_FILE);
        PUB_LOG(g_pub_util_log, "pthread_kill(): %d - %s", error_number, strerror(error_number));
        return error_number;
    }
    const int saved_errno = errno;
    poll_until(get_deadline(END_WAIT_MS), nullptr);
    errno = saved_errno;
    *thread_ptr = 0;
    return PUB_ERR_NONE;
}

void pub_util_handle_thread_signal(int signal_number)
{
    if (signal_number != SIGUSR1) {
        pub_log_entry(g_pub_util_log);
        pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
        PUB_LOG(g_pub_util_log, "unknown signal: %d", signal_number);
        return;
    }
    if (t_end.m_is_forbidden != 0) {
        return;
    }
    if (t_end.m_is_deferred != 0) {
        t_end.m_is_noted = 1;
        return;
    }
    /* The farewell is work, too: a second signal must not end the thread in the middle of it. */
    t_end.m_is_deferred = 1;
    t_end.m_is_forbidden = 1;
    pub_log_entry(g_pub_util_log);
    PUB_LOG(g_pub_util_log, "thread %d will be end", static_cast<int>(gettid()));
    pthread_exit(nullptr);
}
