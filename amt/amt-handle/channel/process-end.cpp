#include "amt/amt-handle/channel/process-end.h"

#include <atomic>
#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <sys/time.h>
#include <sys/types.h>
#include <unistd.h>

#include "pub/util/signal-table.h"
#include "pub/util/thread-end.h"

namespace {

/* A shut-down takes some 50 ms; what is not done after this is stuck. In microseconds. */
constexpr long WATCHDOG_US = 800000;

std::atomic<pid_t> g_service_pid;

/* Set in every child that has been forked, before fork returns there; everywhere when that cannot be had. */
std::atomic<bool> g_may_be_child;

std::atomic<pthread_t> g_ender;
std::atomic<int> g_exit_status;
std::atomic<int (*)()> g_shut_down;

void handle_watchdog(int)
{
    _exit(g_exit_status);
}

void start_watchdog()
{
    struct sigaction action = {};
    action.sa_handler = handle_watchdog;
    sigaction(SIGALRM, &action, nullptr);
    const itimerval time = {{0, 0}, {0, WATCHDOG_US}};
    setitimer(ITIMER_REAL, &time, nullptr);
}

/*
 * The ender may run in the handler of a fault, where that fault is blocked, and another one in the shut-down
 * would be the kernel's to treat: it would end the process with that signal's status.
 */
void set_enders_mask()
{
    const sigset_t terminating = pub_util_get_signal_set({SIGINT, SIGTERM, SIGUSR2});
    const sigset_t needed = pub_util_get_signal_set({SIGALRM, SIGBUS, SIGSEGV});
    pthread_sigmask(SIG_BLOCK, &terminating, nullptr);
    pthread_sigmask(SIG_UNBLOCK, &needed, nullptr);
}

[[noreturn]] void give_way()
{
    for (;;) {
        pause();
    }
}

void note_child()
{
    g_may_be_child = true;
}

} // namespace

void amt_process_end_set_shut_down(int (*shut_down)())
{
    g_shut_down = shut_down;
}

void amt_process_end_begin(int exit_status)
{
    if (!amt_service_process_is_own()) {
        _exit(0);
    }
    const int saved_errno = errno;
    pthread_t ender = 0;
    if (!g_ender.compare_exchange_strong(ender, pthread_self())) {
        if (pthread_equal(ender, pthread_self()) != 0) {
            amt_process_end_finish();
        }
        give_way();
    }
    pub_util_forbid_thread_end();
    g_exit_status = exit_status;
    start_watchdog();
    set_enders_mask();
    errno = saved_errno;
}

bool amt_process_end_has_begun()
{
    return g_ender != pthread_t{};
}

void amt_process_end_by_fault()
{
    if (pthread_equal(g_ender, pthread_self()) != 0) {
        amt_process_end_finish();
    }
    give_way();
}

void amt_process_end_finish()
{
    _exit(g_exit_status);
}

void amt_process_end()
{
    amt_process_end_begin(0);
    int (*const shut_down)() = g_shut_down;
    if (shut_down != nullptr) {
        shut_down();
    }
    amt_process_end_finish();
}

void amt_service_process_mark()
{
    g_service_pid = getpid();
    g_may_be_child = pthread_atfork(nullptr, nullptr, note_child) != 0;
}

bool amt_service_process_is_own()
{
    const pid_t service_pid = g_service_pid;
    return service_pid == 0 || service_pid == getpid();
}

bool amt_service_process_is_child()
{
    return g_may_be_child && !amt_service_process_is_own();
}
