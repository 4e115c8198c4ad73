#include "pub/util/thread-end.h"

#include <atomic>
#include <chrono>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <string.h>
#include <string>
#include <sys/syscall.h>
#include <sys/time.h>
#include <time.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "pub/log/log.h"
#include "pub/util/util.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/log-capture.h"

namespace {

using steady_clock_t = std::chrono::steady_clock;

const std::string KILL = "pub_util_kill_thread";
const std::string HANDLE = "pub_util_handle_thread_signal";

/* What a thread returns that was not ended. */
int g_return_mark = 0;

std::atomic<int> g_step{0};     /* how far the thread has come */
std::atomic<int> g_released{0}; /* the test lets it go on */
std::atomic<int> g_thread_id{0};
int g_pipe_a[2] = {-1, -1};

long elapsed_ms(steady_clock_t::time_point start)
{
    return static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(steady_clock_t::now() - start).count());
}

void wait_for(const std::atomic<int> &value, int wanted)
{
    while (value != wanted) {
        usleep(1000);
    }
}

class thread_end : public testing::Test {
protected:
    void SetUp() override
    {
        /* Not restarting: ThreadSanitizer holds a signal back until the interrupted read returns. */
        struct sigaction action = {};
        action.sa_handler = pub_util_handle_thread_signal;
        ASSERT_EQ(sigaction(SIGUSR1, &action, nullptr), 0);
        ASSERT_EQ(pipe2(g_pipe_a, O_CLOEXEC), 0);
        g_step = 0;
        g_released = 0;
    }
    void TearDown() override
    {
        close(g_pipe_a[0]);
        close(g_pipe_a[1]);
    }

    void start(void *(*body)(void *))
    {
        ASSERT_EQ(pthread_create(&m_thread, nullptr, body, nullptr), 0);
        m_handle = m_thread;
        wait_for(g_step, 1);
    }

    /* Joins the thread; whether it was ended, that is, did not return. */
    bool was_ended() const
    {
        void *result = nullptr;
        EXPECT_EQ(pthread_join(m_thread, &result), 0);
        return result != &g_return_mark;
    }

    pthread_t m_thread = 0;
    pthread_t m_handle = 0; /* the handle that the operation clears */
};

/*
 * ThreadSanitizer makes its record of a thread's signals with the thread's first call that waits, and loses a
 * signal that comes at that very moment.
 */
void say_started()
{
    usleep(1);
    g_step = 1;
}

void *read_for_ever(void *)
{
    pub_util_defer_thread_end();
    pub_util_allow_thread_end();
    say_started();
    char byte = 0;
    while (read(g_pipe_a[0], &byte, 1) != 1) {
    }
    return &g_return_mark;
}

void *work_then_allow(void *)
{
    pub_util_defer_thread_end();
    g_thread_id = static_cast<int>(gettid());
    say_started();
    while (g_released == 0) {
        usleep(1000);
    }
    g_step = 2;
    pub_util_allow_thread_end();
    g_step = 3;
    usleep(1000); /* where a sanitizer may still have the signal in its hands */
    return &g_return_mark;
}

void *work_then_sleep(void *)
{
    pub_util_defer_thread_end();
    say_started();
    pub_util_sleep_ms(600000);
    return &g_return_mark;
}

void *wait_on_a_pipe_for_ever(void *)
{
    pub_util_defer_thread_end();
    say_started();
    pub_util_wait_fd(g_pipe_a[0], POLLIN, 600000);
    return &g_return_mark;
}

void *kill_another(void *handle_ptr)
{
    pub_util_defer_thread_end();
    say_started();
    while (g_released == 0) {
        usleep(1000);
    }
    pub_util_kill_thread(static_cast<pthread_t *>(handle_ptr));
    g_step = 2;
    pub_util_allow_thread_end();
    g_step = 3;
    return &g_return_mark;
}

void *open_for_ever(void *)
{
    pub_util_defer_thread_end();
    say_started();
    int fd = -1;
    pub_util_try_to_open_device(&fd, "/dev/null/none", O_RDWR, 60, 60000);
    return &g_return_mark;
}

void *forbid_after_note(void *)
{
    pub_util_defer_thread_end();
    say_started();
    while (g_released == 0) {
        usleep(1000);
    }
    pub_util_forbid_thread_end();
    pub_util_allow_thread_end();
    EXPECT_TRUE(pub_util_is_thread_end_deferred()) << "what is forbidden is not changed any more";
    usleep(1000);
    return &g_return_mark;
}

void *forbid_then_read(void *)
{
    pub_util_forbid_thread_end();
    pub_util_defer_thread_end();
    EXPECT_FALSE(pub_util_is_thread_end_deferred());
    return read_for_ever(nullptr);
}

void *handle_directly(void *)
{
    g_thread_id = static_cast<int>(gettid());
    pub_util_handle_thread_signal(SIGUSR1);
    return &g_return_mark;
}

void *return_at_once(void *)
{
    say_started();
    return &g_return_mark;
}

void ignore_signal(int) {}

} // namespace

/* The handler's own log is seen elsewhere: the capture allocates, which a handler must not. */
TEST_F(thread_end, thread_that_reads_is_ended)
{
    start(read_for_ever);
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_EQ(m_handle, 0U);
    EXPECT_TRUE(was_ended());
}

TEST_F(thread_end, stopping_waits_ten_milliseconds)
{
    start(read_for_ever);
    const steady_clock_t::time_point begin = steady_clock_t::now();
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_GE(elapsed_ms(begin), 10);
    EXPECT_TRUE(was_ended());
}

TEST_F(thread_end, working_thread_is_ended_where_it_allows_it)
{
    start(work_then_allow);
    const log_capture_c capture;
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_EQ(m_handle, 0U);
    EXPECT_EQ(g_step, 1);
    EXPECT_THAT(capture.texts(), testing::ElementsAre(KILL + "()"));
    g_released = 1;
    EXPECT_TRUE(was_ended());
    EXPECT_EQ(g_step, 2) << "it went on past the allowing call";
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre(KILL + "()", HANDLE + "()",
                                     "thread " + std::to_string(g_thread_id) + " will be end"));
}

TEST_F(thread_end, second_signal_of_a_working_thread_changes_nothing)
{
    start(work_then_allow);
    pthread_t other_handle = m_handle;
    const log_capture_c capture;
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_EQ(pub_util_kill_thread(&other_handle), PUB_ERR_NONE);
    g_released = 1;
    EXPECT_TRUE(was_ended());
    EXPECT_EQ(capture.count_containing("will be end"), 1);
}

TEST_F(thread_end, thread_without_a_signal_goes_on_when_it_allows)
{
    start(work_then_allow);
    g_released = 1;
    EXPECT_FALSE(was_ended());
    EXPECT_EQ(g_step, 3);
}

TEST_F(thread_end, pause_may_be_ended)
{
    start(work_then_sleep);
    const steady_clock_t::time_point begin = steady_clock_t::now();
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_TRUE(was_ended());
    EXPECT_LT(elapsed_ms(begin), 60000);
}

TEST_F(thread_end, pause_between_attempts_to_open_may_be_ended)
{
    start(open_for_ever);
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_TRUE(was_ended());
}

TEST_F(thread_end, wait_on_a_descriptor_may_be_ended)
{
    start(wait_on_a_pipe_for_ever);
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_TRUE(was_ended());
}

/* Who stops another holds locks for it. */
TEST_F(thread_end, stopping_another_is_not_cut_short)
{
    start(read_for_ever);
    const pthread_t reader = m_thread;
    g_step = 0;
    ASSERT_EQ(pthread_create(&m_thread, nullptr, kill_another, &m_handle), 0);
    wait_for(g_step, 1);
    ASSERT_EQ(pthread_kill(m_thread, SIGUSR1), 0);
    g_released = 1;
    EXPECT_TRUE(was_ended());
    EXPECT_EQ(g_step, 2);
    EXPECT_EQ(m_handle, 0U);
    EXPECT_EQ(pthread_join(reader, nullptr), 0);
}

TEST_F(thread_end, forbidden_end_overrides_a_note)
{
    start(forbid_after_note);
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    g_released = 1;
    EXPECT_FALSE(was_ended());
}

TEST_F(thread_end, forbidden_end_does_not_disturb_the_thread)
{
    start(forbid_then_read);
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_EQ(m_handle, 0U);
    EXPECT_EQ(write(g_pipe_a[1], "x", 1), 1);
    EXPECT_FALSE(was_ended());
}

TEST_F(thread_end, handler_says_farewell)
{
    const log_capture_c capture;
    ASSERT_EQ(pthread_create(&m_thread, nullptr, handle_directly, nullptr), 0);
    EXPECT_TRUE(was_ended());
    EXPECT_THAT(capture.texts(), testing::ElementsAre(HANDLE + "()", "thread " + std::to_string(g_thread_id) +
                                                                         " will be end"));
}

TEST_F(thread_end, handler_logs_any_other_signal)
{
    const log_capture_c capture;
    errno = 0;
    pub_util_handle_thread_signal(12);
    EXPECT_THAT(
        without_line_numbers(capture),
        testing::ElementsAre(HANDLE + "()", error_line("util/util", HANDLE, -101, 0), "unknown signal: 12"));
}

TEST_F(thread_end, kill_of_no_thread_is_done_at_once)
{
    const log_capture_c capture;
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_EQ(m_handle, 0U);
    EXPECT_THAT(capture.texts(), testing::ElementsAre(KILL + "()"));
}

TEST_F(thread_end, kill_of_a_thread_that_is_gone)
{
    start(return_at_once);
    usleep(50000);
    EXPECT_EQ(pub_util_kill_thread(&m_handle), PUB_ERR_NONE);
    EXPECT_FALSE(was_ended());
}

TEST_F(thread_end, kill_without_a_handle)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_kill_thread(nullptr), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(KILL + "()", error_line("util/util", KILL, -101, 0), "1"));
}

TEST_F(thread_end, kill_of_a_thread_the_kernel_does_not_know)
{
    const child_run_st run = run_in_child(
        [] {
            pthread_t handle = pthread_self();
            const int status = pub_util_kill_thread(&handle);
            return handle != 0 ? status : -1;
        },
        {SYS_tgkill, ESRCH});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_NONE);
    EXPECT_THAT(run.m_text_list, testing::ElementsAre(KILL + "()"));
}

TEST_F(thread_end, kill_that_is_refused)
{
    const child_run_st run = run_in_child(
        [] {
            pthread_t handle = pthread_self();
            const int status = pub_util_kill_thread(&handle);
            return handle != 0 ? status : -1;
        },
        {SYS_tgkill, EPERM});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, EPERM);
    EXPECT_THAT(run.m_text_list, testing::ElementsAre(KILL + "()", error_line("util/util", KILL, -118, EPERM),
                                                      std::string("pthread_kill(): 1 - ") + strerror(EPERM)));
}

TEST_F(thread_end, signals_do_not_shorten_a_pause)
{
    struct sigaction action = {};
    action.sa_handler = ignore_signal;
    ASSERT_EQ(sigaction(SIGALRM, &action, nullptr), 0);
    itimerval timer = {};
    timer.it_value.tv_usec = 5000;
    timer.it_interval.tv_usec = 5000;
    ASSERT_EQ(setitimer(ITIMER_REAL, &timer, nullptr), 0);
    /* Into the next second, where the clock's nanoseconds begin anew. */
    timespec now = {};
    for (clock_gettime(CLOCK_MONOTONIC, &now); now.tv_nsec < 500000000L; clock_gettime(CLOCK_MONOTONIC, &now))
    {
        usleep(1000);
    }
    errno = EXDEV;
    const steady_clock_t::time_point begin = steady_clock_t::now();
    pub_util_sleep_ms(600);
    EXPECT_GE(elapsed_ms(begin), 600);
    EXPECT_EQ(errno, EXDEV);
    timer = {};
    ASSERT_EQ(setitimer(ITIMER_REAL, &timer, nullptr), 0);
}

TEST_F(thread_end, wait_on_a_descriptor_says_what_there_is)
{
    EXPECT_EQ(pub_util_wait_fd(g_pipe_a[0], POLLIN, 0), 0);
    EXPECT_EQ(pub_util_wait_fd(g_pipe_a[1], POLLOUT, 600000), 1);
    EXPECT_EQ(write(g_pipe_a[1], "x", 1), 1);
    EXPECT_EQ(pub_util_wait_fd(g_pipe_a[0], POLLIN, 600000), 1);
    for (const int fd : {-1, 1 << 20}) {
        errno = 0;
        EXPECT_EQ(pub_util_wait_fd(fd, POLLIN, 600000), -1);
        EXPECT_EQ(errno, EBADF);
    }
}

TEST_F(thread_end, pause_leaves_deferral_as_it_was)
{
    EXPECT_FALSE(pub_util_is_thread_end_deferred());
    pub_util_sleep_ms(1);
    EXPECT_FALSE(pub_util_is_thread_end_deferred());
    pub_util_defer_thread_end();
    pub_util_sleep_ms(1);
    EXPECT_TRUE(pub_util_is_thread_end_deferred());
    pub_util_allow_thread_end();
    EXPECT_FALSE(pub_util_is_thread_end_deferred());
}
