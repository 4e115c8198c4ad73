#include "amt/amt-handle/channel/process-end.h"

#include <chrono>
#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/startup.h"
#include "pub/util/thread-end.h"
#include "pub/util/util.h"
#include "tests/unit/support/log-capture.h"

namespace {

using steady_clock_t = std::chrono::steady_clock;

/* Writes where nothing may be written. */
void raise_fault()
{
    void *const page = mmap(nullptr, 1, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    *static_cast<volatile char *>(page) = 1;
}

[[noreturn]] void wait_for_ever()
{
    for (;;) {
        pause();
    }
}

/* Says on standard error that the hub was shut down, and shuts it down. */
int shut_down_audibly()
{
    const ssize_t ignored = write(STDERR_FILENO, "shut down\n", 10);
    static_cast<void>(ignored);
    return amt_handle_deinit();
}

/* A shut-down that takes the watchdog's time away: nobody else ends the process. */
int shut_down_the_watchdog()
{
    const itimerval never = {};
    return setitimer(ITIMER_REAL, &never, nullptr);
}

/* A shut-down that meets a fault. */
int shut_down_into_a_fault()
{
    shut_down_the_watchdog();
    raise_fault();
    return 0;
}

void *end_process(void *)
{
    amt_process_end();
}

/* Ends the process from many threads at once; the one that wins must find the line open. */
[[noreturn]] void end_from_many_threads(int fd)
{
    g_handle_context.m_fd_pc = fd;
    amt_process_end_set_shut_down(shut_down_audibly);
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

[[noreturn]] void end_without_a_watchdog()
{
    amt_process_end_set_shut_down(shut_down_the_watchdog);
    amt_process_end();
}

/* The main thread comes late to an end that another thread has begun. */
[[noreturn]] void end_behind_another_thread()
{
    amt_process_end_set_shut_down(shut_down_audibly);
    pthread_t thread = 0;
    pthread_create(
        &thread, nullptr,
        [](void *) -> void * {
            amt_process_end_begin(4);
            usleep(100000);
            shut_down_audibly();
            amt_process_end_finish();
        },
        nullptr);
    while (!amt_process_end_has_begun()) {
        usleep(100);
    }
    amt_process_end();
}

[[noreturn]] void end_twice_on_one_thread()
{
    amt_process_end_begin(4);
    shut_down_the_watchdog(); /* nobody else is to end it */
    amt_process_end_begin(5); /* as a fault in the shut-down does */
    _exit(99);
}

/* The first fault ends the process in its handler; the second one meets it there. */
[[noreturn]] void end_in_a_handler_with_a_fault()
{
    amt_process_end_set_shut_down(shut_down_into_a_fault);
    signal(SIGSEGV, [](int) {
        if (amt_process_end_has_begun()) {
            amt_process_end_by_fault();
        }
        amt_process_end();
    });
    raise_fault();
    _exit(99);
}

[[noreturn]] void end_while_another_thread_faults()
{
    signal(SIGSEGV, [](int) { amt_process_end_by_fault(); });
    amt_process_end_begin(7);
    pthread_t thread = 0;
    pthread_create(
        &thread, nullptr,
        [](void *) -> void * {
            raise_fault();
            _exit(99);
        },
        nullptr);
    usleep(50000);
    shut_down_audibly();
    amt_process_end_finish();
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
        EXPECT_EXIT(end_from_many_threads(fd_a[0]), testing::ExitedWithCode(0), "^shut down\n$");
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

TEST(process_end, needs_no_watchdog)
{
    EXPECT_EXIT(end_without_a_watchdog(), testing::ExitedWithCode(0), "");
}

TEST(process_end, is_that_of_the_thread_that_began_it)
{
    EXPECT_EXIT(end_behind_another_thread(), testing::ExitedWithCode(4), "^shut down\n$");
}

TEST(process_end, that_fails_itself_ends_at_once)
{
    EXPECT_EXIT(end_twice_on_one_thread(), testing::ExitedWithCode(4), "");
}

TEST(process_end, that_meets_a_fault_in_a_fault_s_handler_has_its_status)
{
    EXPECT_EXIT(end_in_a_handler_with_a_fault(), testing::ExitedWithCode(0), "");
}

TEST(process_end, waits_for_the_ender_after_a_fault_of_another_thread)
{
    EXPECT_EXIT(end_while_another_thread_faults(), testing::ExitedWithCode(7), "^shut down\n$");
}

TEST(process_end, knows_whether_it_has_begun)
{
    EXPECT_FALSE(amt_process_end_has_begun());
    const auto begin = [] {
        errno = EXDEV;
        amt_process_end_begin(8);
        _exit(amt_process_end_has_begun() && errno == EXDEV ? 0 : 1);
    };
    EXPECT_EXIT(begin(), testing::ExitedWithCode(0), "");
}

TEST(process_end, is_not_moved_by_signals)
{
    EXPECT_EXIT(end_unmoved_by_signals(), testing::ExitedWithCode(6), "");
}

/* The exit status of a child that has made the check. */
template <typename check_t> int try_in_child(check_t check)
{
    const pid_t pid = fork();
    if (pid == 0) {
        _exit(check() ? 0 : 1);
    }
    int status = -1;
    EXPECT_EQ(waitpid(pid, &status, 0), pid);
    return status;
}

TEST(service_process, that_was_never_marked_is_nobody_s_child)
{
    const auto check = [] {
        return try_in_child([] { return amt_service_process_is_own() && !amt_service_process_is_child(); });
    };
    EXPECT_EQ(check(), 0);
}

[[noreturn]] void mark_and_fork()
{
    amt_service_process_mark();
    if (!amt_service_process_is_own() || amt_service_process_is_child()) {
        _exit(1);
    }
    const auto is_told_apart = [] { return amt_service_process_is_child() && !amt_service_process_is_own(); };
    if (try_in_child([&] { return is_told_apart() && try_in_child(is_told_apart) == 0; }) != 0) {
        _exit(2);
    }
    _exit(amt_service_process_is_own() && !amt_service_process_is_child() ? 0 : 3);
}

TEST(service_process, knows_its_children_from_itself)
{
    EXPECT_EXIT(mark_and_fork(), testing::ExitedWithCode(0), "");
}

[[noreturn]] void mark_and_end_in_a_child()
{
    amt_service_process_mark();
    const int status = try_in_child([] {
        amt_process_end_begin(9);
        return false;
    });
    _exit(status == 0 && !amt_process_end_has_begun() ? 0 : 1);
}

/* The lines are the service's: what a child could shut down would be missing there. */
TEST(service_process, is_not_ended_by_a_child)
{
    EXPECT_EXIT(mark_and_end_in_a_child(), testing::ExitedWithCode(0), "");
}

TEST(shut_down, happens_once)
{
    EXPECT_EXIT(shut_down_twice(), testing::ExitedWithCode(0), "");
}

} // namespace
