#include "pub/util/util.h"

#include <atomic>
#include <dlfcn.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/support/log-capture.h"

namespace {

constexpr int INTERRUPT_COUNT = 10;

/* How often the process has waited without a descriptor. */
std::atomic<int> g_pause_count;

} // namespace

TEST(run_shell, gives_the_commands_status)
{
    const log_capture_c capture;
    EXPECT_EQ(pub_util_run_shell("exit 0"), 0);
    EXPECT_EQ(WEXITSTATUS(pub_util_run_shell("exit 7")), 7);
    EXPECT_THAT(capture.texts(), testing::IsEmpty());
}

TEST(run_shell, waits_for_no_interrupt_when_none_is_on_its_way)
{
    sigset_t interrupt;
    sigset_t after;
    sigemptyset(&interrupt);
    sigaddset(&interrupt, SIGINT);
    pthread_sigmask(SIG_UNBLOCK, &interrupt, nullptr);
    g_pause_count = 0;
    EXPECT_EQ(pub_util_run_shell("exit 0"), 0);
    EXPECT_EQ(g_pause_count, 0);
    pthread_sigmask(SIG_SETMASK, nullptr, &after);
    EXPECT_EQ(sigismember(&after, SIGINT), 0);
}

TEST(run_shell, lets_an_interrupt_on_its_way_get_there_first)
{
    const child_run_st run = run_in_child([] {
        sigset_t interrupt;
        sigemptyset(&interrupt);
        sigaddset(&interrupt, SIGINT);
        pthread_sigmask(SIG_BLOCK, &interrupt, nullptr);
        int taken = 0;
        for (int i = 0; i < INTERRUPT_COUNT; i++) {
            /* On its way before the command begins; it is taken only when the command has had time to begin. */
            kill(getpid(), SIGINT);
            pthread_t thread = 0;
            const auto run_one = [](void *) -> void * {
                pub_util_run_shell(":");
                return nullptr;
            };
            pthread_create(&thread, nullptr, run_one, nullptr);
            const timespec head_start = {0, 5000000};
            nanosleep(&head_start, nullptr);
            const timespec no_time = {};
            taken += sigtimedwait(&interrupt, nullptr, &no_time) == SIGINT ? 1 : 0;
            pthread_join(thread, nullptr);
        }
        return taken;
    });
    ASSERT_TRUE(run.m_is_complete);
    EXPECT_EQ(run.m_result, INTERRUPT_COUNT);
}

extern "C" int poll(pollfd *fd_ptr, nfds_t count, int timeout_ms)
{
    g_pause_count += count == 0 ? 1 : 0;
    using poll_func = int (*)(pollfd *, nfds_t, int);
    static const poll_func next = reinterpret_cast<poll_func>(dlsym(RTLD_NEXT, "poll"));
    return next(fd_ptr, count, timeout_ms);
}
