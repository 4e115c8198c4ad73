#include "pub/util/thread-end.h"

#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include "pub/error.h"
#include "pub/pub-log.h"
#include "pub/util/util.h"

namespace {

constexpr uint32_t END_WAIT_MS = 10;

/* Each thread's own, so that a handler on that thread is the only one that interferes. */
thread_local volatile sig_atomic_t t_is_deferred = 0;
thread_local volatile sig_atomic_t t_is_forbidden = 0;
thread_local volatile sig_atomic_t t_is_noted = 0;

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

} // namespace

void pub_util_defer_thread_end()
{
    pthread_once(&g_unwinder_once, load_unwinder);
    if (t_is_forbidden == 0) {
        t_is_deferred = 1;
    }
}

void pub_util_allow_thread_end()
{
    if (t_is_forbidden != 0) {
        return;
    }
    t_is_deferred = 0;
    if (t_is_noted != 0) {
        pub_util_handle_thread_signal(SIGUSR1);
    }
}

void pub_util_forbid_thread_end()
{
    t_is_forbidden = 1;
}

bool pub_util_is_thread_end_deferred()
{
    return t_is_deferred != 0;
}

void pub_util_sleep_ms(uint32_t ms)
{
    const int saved_errno = errno;
    const bool was_deferred = pub_util_is_thread_end_deferred();
    timespec left = {};
    left.tv_sec = static_cast<time_t>(ms / 1000);
    left.tv_nsec = static_cast<long>(ms % 1000) * 1000000L;
    pub_util_allow_thread_end();
    /* nanosleep, which the kernel measures on its monotonic clock: ThreadSanitizer delivers signals in it. */
    while (nanosleep(&left, &left) != 0 && errno == EINTR) {
    }
    errno = saved_errno;
    if (was_deferred) {
        pub_util_defer_thread_end();
    }
}

int pub_util_kill_thread(pthread_t *thread_ptr)
{
    pub_log_entry(g_pub_util_log);
    if (thread_ptr == nullptr) {
        pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
        pub_log_flags(g_pub_util_log, {true});
        return PUB_ERR_PARAM;
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
    pub_util_sleep_ms(END_WAIT_MS);
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
    if (t_is_forbidden != 0) {
        return;
    }
    if (t_is_deferred != 0) {
        t_is_noted = 1;
        return;
    }
    /* The farewell is work, too: a second signal must not end the thread in the middle of it. */
    t_is_deferred = 1;
    t_is_forbidden = 1;
    pub_log_entry(g_pub_util_log);
    PUB_LOG(g_pub_util_log, "thread %d will be end", static_cast<int>(gettid()));
    pthread_exit(nullptr);
}
