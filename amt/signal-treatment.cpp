#include "amt/signal-treatment.h"

#include <atomic>
#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/startup.h"
#include "amt/amt-log.h"
#include "pub/file/file.h"
#include "pub/util/signal-table.h"
#include "pub/util/thread-end.h"

namespace {

/* Seconds of one sleep of the main thread, which sleeps for ever. */
constexpr time_t SLEEP_SECONDS = 0xFFFFFFF;
constexpr uint32_t SETTLE_PAUSE_MS = 1;
constexpr uint32_t STAT_PATH_SIZE = 48;
constexpr uint32_t STAT_LINE_SIZE = 128;
constexpr char ASLEEP[] = ") S ";

constexpr int treated_signal_a[] = {SIGINT, SIGTERM, SIGSEGV, SIGBUS, SIGUSR2};
static_assert(SIGUSR2 == 12); /* the number is what counts for who sends it */

pthread_t g_main_thread;
amt_worker_st *g_starter_ptr = nullptr;

/* Set by the main thread when nothing but its wait for signals is left to it. */
std::atomic<bool> g_is_taking{false};

/* Set by the starter, with a SIGUSR1 behind it; cleared by the main thread. */
std::atomic<bool> g_is_to_settle{false};

bool is_fault(int signal_number)
{
    return signal_number == SIGSEGV || signal_number == SIGBUS;
}

/* The signals that end the process and are no faults. */
sigset_t get_terminating_set()
{
    return pub_util_get_signal_set({SIGINT, SIGTERM, SIGUSR2});
}

/* What the main thread takes: those, and the starter's call. */
sigset_t get_taken_set()
{
    return pub_util_get_signal_set({SIGINT, SIGTERM, SIGUSR2, SIGUSR1});
}

/* The end begins before its first record, which may find the log stuck. */
[[noreturn]] void end_by_signal(int signal_number)
{
    amt_process_end_begin(0);
    PUB_LOG(g_amt_main_log, "signal_treatment()");
    PUB_LOG(g_amt_main_log, "receive signal: %d - %s", signal_number,
            pub_util_get_signal_name(signal_number));
    amt_worker_stop(g_starter_ptr);
    amt_deinit_resource();
    amt_process_end_finish();
}

/* Only the kernel's own codes are above 0: the calling thread's last instruction has failed. */
bool is_own_fault(int signal_number, const siginfo_t *info_ptr)
{
    return is_fault(signal_number) && info_ptr->si_code > 0;
}

/*
 * Once an end has begun, a signal changes nothing any more. Before that, every one but the main thread's own
 * faults is handed to the main thread.
 */
void signal_treatment(int signal_number, siginfo_t *info_ptr, void *)
{
    if (!amt_service_process_is_own()) {
        _exit(0);
    }
    const int saved_errno = errno;
    if (!amt_process_end_has_begun()) {
        if (pthread_equal(pthread_self(), g_main_thread) != 0) {
            end_by_signal(signal_number);
        }
        pthread_kill(g_main_thread, signal_number);
    }
    if (is_own_fault(signal_number, info_ptr)) {
        amt_process_end_by_fault();
    }
    errno = saved_errno;
}

/* Does nothing, but is no SIG_IGN: the write fails all the same, and a started program has the default. */
void notice_broken_pipe(int) {}

void forget_ignored_signals()
{
    for (int signal_number = 1; signal_number < NSIG; signal_number++) {
        struct sigaction action = {};
        if (sigaction(signal_number, nullptr, &action) == 0 && action.sa_handler == SIG_IGN) {
            signal(signal_number, SIG_DFL);
        }
    }
}

/* As signal() installs a handler, with the sender's part added. */
void install_signal_treatment()
{
    struct sigaction action = {};
    action.sa_sigaction = signal_treatment;
    action.sa_flags = SA_RESTART | SA_SIGINFO;
    for (const int signal_number : treated_signal_a) {
        sigaction(signal_number, &action, nullptr);
    }
}

/*
 * Whether the main thread sleeps. Its state stands behind the program's name, in parentheses, which may hold some
 * itself. Where the system does not tell, it counts as asleep. (/proc/self/stat holds the state too, but an
 * emulator may put its own file there.)
 */
bool is_main_thread_asleep()
{
    char path_a[STAT_PATH_SIZE];
    char line_a[STAT_LINE_SIZE];
    snprintf(path_a, sizeof(path_a), "/proc/self/task/%d/stat", static_cast<int>(getpid()));
    if (pub_file_read_line(path_a, line_a, sizeof(line_a)) != pub_file_step_en::DONE) {
        return true;
    }
    const char *const end_ptr = strrchr(line_a, ')');
    return end_ptr == nullptr || strncmp(end_ptr, ASLEEP, sizeof(ASLEEP) - 1) == 0;
}

void answer_starter()
{
    if (!g_is_to_settle) {
        return;
    }
    const sigset_t terminating = get_terminating_set();
    const timespec no_time = {};
    const int signal_number = sigtimedwait(&terminating, nullptr, &no_time);
    if (signal_number > 0) {
        end_by_signal(signal_number);
    }
    g_is_to_settle = false;
}

} // namespace

void amt_signal_prepare()
{
    g_main_thread = pthread_self();
    pub_log_prepare_thread();
    pub_util_forbid_thread_end();
    const sigset_t taken = get_taken_set();
    pthread_sigmask(SIG_SETMASK, &taken, nullptr);
    forget_ignored_signals();
    install_signal_treatment();
    signal(SIGUSR1, pub_util_handle_thread_signal);
    signal(SIGPIPE, notice_broken_pipe);
}

void amt_signal_take(amt_worker_st *starter_ptr)
{
    g_starter_ptr = starter_ptr;
    const sigset_t taken = get_taken_set();
    g_is_taking = true;
    for (;;) {
        const timespec time = {SLEEP_SECONDS, 0};
        const int signal_number = sigtimedwait(&taken, nullptr, &time);
        if (signal_number == SIGUSR1) {
            answer_starter();
        } else if (signal_number > 0) {
            end_by_signal(signal_number);
        }
    }
}

void amt_signal_await_taker()
{
    /* One that is about to wait may be displaced just before, so it must be seen asleep; but an end sleeps, too. */
    while (!g_is_taking || !is_main_thread_asleep() || amt_process_end_has_begun()) {
        pub_util_sleep_ms(SETTLE_PAUSE_MS);
    }
}

void amt_signal_settle()
{
    /* From here on the caller takes no signal away from the main thread; one it has taken is handed over by now. */
    const sigset_t terminating = get_terminating_set();
    sigset_t own_mask;
    pthread_sigmask(SIG_BLOCK, &terminating, &own_mask);
    g_is_to_settle = true;
    pthread_kill(g_main_thread, SIGUSR1);
    while (g_is_to_settle) {
        pub_util_sleep_ms(SETTLE_PAUSE_MS);
    }
    pthread_sigmask(SIG_SETMASK, &own_mask, nullptr);
}

void amt_deinit_resource()
{
    pub_log_entry(g_amt_main_log);
    amt_handle_deinit();
}
