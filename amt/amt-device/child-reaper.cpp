#include "amt/amt-device/child-reaper.h"

#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <stdint.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include "pub/util/thread-end.h"

namespace {

/*
 * It only waits. The C library keeps the stacks of ended threads for the next ones up to a limit, beyond
 * which the end of any thread frees some; small ones stay below it however many children end at once.
 */
constexpr size_t STACK_SIZE = size_t{64} * 1024;

void wait_for(pid_t child_pid)
{
    while (waitpid(child_pid, nullptr, 0) < 0 && errno == EINTR) {
    }
}

/* The argument is the child's id itself, so that nothing has to outlive the caller. */
void *run_reaper(void *argument)
{
    wait_for(static_cast<pid_t>(reinterpret_cast<intptr_t>(argument)));
    return nullptr;
}

int start_reaper(pid_t child_pid)
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

} // namespace

void amt_child_reap(pid_t child_pid)
{
    /* Signals are for the threads that know them: the reaper inherits a mask that blocks them all. */
    sigset_t all_set;
    sigset_t old_set;
    sigfillset(&all_set);
    pthread_sigmask(SIG_SETMASK, &all_set, &old_set);
    const int error = start_reaper(child_pid);
    pthread_sigmask(SIG_SETMASK, &old_set, nullptr);
    if (error != 0) {
        const bool was_deferred = pub_util_is_thread_end_deferred();
        pub_util_allow_thread_end();
        wait_for(child_pid);
        if (was_deferred) {
            pub_util_defer_thread_end();
        }
    }
}

void amt_child_die_with(pid_t parent_pid)
{
    prctl(PR_SET_PDEATHSIG, static_cast<unsigned long>(SIGKILL));
    if (getppid() != parent_pid) {
        _exit(0);
    }
}
