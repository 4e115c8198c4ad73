#include "amt/amt-handle/channel/process-end.h"

#include <atomic>
#include <pthread.h>
#include <signal.h>
#include <sys/time.h>
#include <unistd.h>

#include "amt/amt-handle/channel/service-process.h"
#include "amt/amt-handle/startup.h"
#include "pub/util/thread-end.h"

namespace {

/* A shut-down takes some 50 ms; what is not done after this is stuck. In microseconds. */
constexpr long WATCHDOG_US = 800000;

std::atomic<pthread_t> g_ender;
std::atomic<int> g_exit_status;

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

void block_terminating_signals()
{
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGINT);
    sigaddset(&set, SIGTERM);
    sigaddset(&set, SIGUSR2);
    pthread_sigmask(SIG_BLOCK, &set, nullptr);
}

/* A fault in the shut-down itself cannot be shut down again. */
[[noreturn]] void give_way(pthread_t ender)
{
    if (pthread_equal(ender, pthread_self()) != 0) {
        _exit(g_exit_status);
    }
    for (;;) {
        pause();
    }
}

} // namespace

void amt_process_end_begin(int exit_status)
{
    if (!amt_service_process_is_own()) {
        _exit(0);
    }
    pub_util_forbid_thread_end();
    block_terminating_signals();
    pthread_t nobody = 0;
    if (!g_ender.compare_exchange_strong(nobody, pthread_self())) {
        give_way(nobody);
    }
    g_exit_status = exit_status;
    start_watchdog();
}

void amt_process_end_finish()
{
    _exit(g_exit_status);
}

void amt_process_end()
{
    amt_process_end_begin(0);
    amt_handle_deinit();
    amt_process_end_finish();
}
