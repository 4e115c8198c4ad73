#include "amt/amt-device/child-reaper.h"

#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <stdint.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include "amt/amt-log.h"
#include "pub/util/signal-table.h"

namespace {

/*
 * It only waits. The C library keeps the stacks of ended threads for the next ones up to a limit, beyond
 * which the end of any thread frees some; small ones stay below it however many children end at once.
 */
constexpr size_t STACK_SIZE = size_t{64} * 1024;

/* Children that no thread waits for; 0 is a free place. */
constexpr uint32_t NOTED_COUNT = 16;
pid_t g_noted_pid_a[NOTED_COUNT];

/* Whether the child is gone; with WNOHANG it may not be. */
bool wait_for(pid_t child_pid, int option)
{
    int status = 0;
    pid_t ended_pid = 0;
    do {
        ended_pid = waitpid(child_pid, &status, option);
    } while (ended_pid < 0 && errno == EINTR);
    if (ended_pid == child_pid && WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        PUB_LOG(g_amt_device_log, "BT-start error. child %d ended by signal %d(%s)", child_pid, number,
                pub_util_get_signal_name(number));
    }
    return ended_pid != 0;
}

/* The argument is the child's id itself, so that nothing has to outlive the caller. */
void *run_reaper(void *argument)
{
    wait_for(static_cast<pid_t>(reinterpret_cast<intptr_t>(argument)), 0);
    return nullptr;
}

int create_reaper(pid_t child_pid)
{
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setdetachstate(&attributes, PTHREAD_CREATE_DETACHED);
    pthread_attr_setstacksize(&attributes, STACK_SIZE);
    pthread_t id;
    /* NOLINTNEXTLINE(performance-no-int-to-ptr): a number that travels as a pointer, never followed */
    void *argument = reinterpret_cast<void *>(static_cast<intptr_t>(child_pid));
    const int error = pthread_create(&id, &attributes, run_reaper, argument);
    pthread_attr_destroy(&attributes);
    return error;
}

/* Signals are for the threads that know them: the reaper inherits a mask that blocks them all. */
int start_reaper(pid_t child_pid)
{
    sigset_t all_set;
    sigset_t old_set;
    sigfillset(&all_set);
    pthread_sigmask(SIG_SETMASK, &all_set, &old_set);
    const int error = create_reaper(child_pid);
    pthread_sigmask(SIG_SETMASK, &old_set, nullptr);
    return error;
}

void ask_for_noted()
{
    for (pid_t &pid : g_noted_pid_a) {
        if (pid != 0 && wait_for(pid, WNOHANG)) {
            pid = 0;
        }
    }
}

void note(pid_t child_pid)
{
    for (pid_t &pid : g_noted_pid_a) {
        if (pid == 0) {
            pid = child_pid;
            return;
        }
    }
    PUB_LOG(g_amt_device_log, "WARNING !");
    PUB_LOG(g_amt_device_log, "nobody waits for child %d", child_pid);
}

} // namespace

void amt_child_reap(pid_t child_pid)
{
    ask_for_noted();
    const int error = start_reaper(child_pid);
    if (error != 0) {
        errno = error;
        pub_log_sys_call(g_amt_device_log, "pthread_create");
        note(child_pid);
    }
}

void amt_child_die_with(pid_t parent_pid)
{
    prctl(PR_SET_PDEATHSIG, static_cast<unsigned long>(SIGKILL));
    if (getppid() != parent_pid) {
        _exit(0);
    }
}
