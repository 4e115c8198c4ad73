#include "amt/amt-handle/channel/process-end.h"

#include <chrono>
#include <pthread.h>
#include <signal.h>
#include <string.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/startup.h"
#include "pub/util/thread-end.h"
#include "pub/util/util.h"
#include "tests/unit/support/log-capture.h"

namespace {

using steady_clock_t = std::chrono::steady_clock;

[[noreturn]] void wait_for_ever()
{
    for (;;) {
        pause();
    }
}

void *end_process(void *)
{
    amt_process_end();
}

/* Ends the process from many threads at once; the one that wins must find the line open. */
[[noreturn]] void end_from_many_threads(int fd)
{
    g_handle_context.m_fd_pc = fd;
    for (int i = 0; i < 8; i++) {
        pthread_t thread = 0;
        pthread_create(&thread, nullptr, end_process, nullptr);
    }
    amt_process_end();
}

[[noreturn]] void end_and_get_stuck()
{
    amt_process_end_begin(3);
    wait_for_ever();
}

[[noreturn]] void end_twice_on_one_thread()
{
    amt_process_end_begin(4);
    amt_process_end_begin(5); /* as a fault in the shut-down does */
    _exit(99);
}

[[noreturn]] void end_unmoved_by_signals()
{
    signal(SIGUSR1, pub_util_handle_thread_signal);
    for (const int signal_number : {SIGINT, SIGTERM, SIGUSR2}) {
        signal(signal_number, [](int) { _exit(98); });
    }
    amt_process_end_begin(6);
    for (const int signal_number : {SIGUSR1, SIGINT, SIGTERM, SIGUSR2}) {
        pthread_kill(pthread_self(), signal_number);
    }
    pub_util_allow_thread_end();
    amt_process_end_finish();
}

[[noreturn]] void end_with_a_failure()
{
    amt_process_end_begin(-118);
    amt_handle_deinit();
    amt_process_end_finish();
}

/* Whether a second shut-down does nothing; the first says so in the log. */
[[noreturn]] void shut_down_twice()
{
    const log_capture_c capture;
    int fd_a[2];
    if (pipe(fd_a) != 0) {
        _exit(97);
    }
    g_handle_context.m_fd_modem = fd_a[0];
    const int first = amt_handle_deinit();
    const int second = amt_handle_deinit();
    char byte = 0;
    const bool is_closed = g_handle_context.m_fd_modem == -1 && read(fd_a[0], &byte, 1) == -1;
    _exit(first == 0 && second == 0 && is_closed && capture.count_containing("amt_handle_deinit()") == 1 ? 0
                                                                                                         : 1);
}

TEST(process_end, has_status_0)
{
    EXPECT_EXIT(amt_process_end(), testing::ExitedWithCode(0), "");
}

TEST(process_end, has_the_status_it_began_with)
{
    EXPECT_EXIT(end_with_a_failure(), testing::ExitedWithCode(-118 & 0xFF), "");
}

TEST(process_end, happens_once_for_many_threads)
{
    int fd_a[2];
    ASSERT_EQ(pipe(fd_a), 0);
    for (int i = 0; i < 5; i++) {
        EXPECT_EXIT(end_from_many_threads(fd_a[0]), testing::ExitedWithCode(0), "");
    }
    close(fd_a[0]);
    close(fd_a[1]);
}

TEST(process_end, that_gets_stuck_ends_within_a_second)
{
    const auto begin = steady_clock_t::now();
    EXPECT_EXIT(end_and_get_stuck(), testing::ExitedWithCode(3), "");
    EXPECT_LT(steady_clock_t::now() - begin, std::chrono::seconds(3));
    EXPECT_GE(steady_clock_t::now() - begin, std::chrono::milliseconds(700));
}

TEST(process_end, that_fails_itself_ends_at_once)
{
    EXPECT_EXIT(end_twice_on_one_thread(), testing::ExitedWithCode(4), "");
}

TEST(process_end, is_not_moved_by_signals)
{
    EXPECT_EXIT(end_unmoved_by_signals(), testing::ExitedWithCode(6), "");
}

TEST(shut_down, happens_once)
{
    EXPECT_EXIT(shut_down_twice(), testing::ExitedWithCode(0), "");
}

} // namespace
