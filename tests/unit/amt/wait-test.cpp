#include "amt/amt-handle/channel/wait.h"

#include <atomic>
#include <chrono>
#include <errno.h>
#include <fcntl.h>
#include <pthread.h>
#include <sched.h>
#include <signal.h>
#include <string>
#include <sys/select.h>
#include <sys/time.h>
#include <time.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "pub/util/thread-end.h"
#include "tests/unit/support/descriptor-swap.h"

namespace {

using steady_clock_t = std::chrono::steady_clock;

/* Only what never happens takes so long. */
constexpr time_t LATE_SECONDS = 20;

long elapsed_ms(steady_clock_t::time_point start)
{
    return static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(steady_clock_t::now() - start).count());
}

class wait_on_pipe : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_EQ(pipe2(m_fd_a, O_CLOEXEC), 0);
    }
    void TearDown() override
    {
        close(m_fd_a[0]);
        close(m_fd_a[1]);
    }

    void say(const std::string &text) const
    {
        ASSERT_EQ(write(m_fd_a[1], text.data(), text.size()), static_cast<ssize_t>(text.size()));
    }

    /* Nobody reads: no more fits. */
    void fill() const
    {
        ASSERT_EQ(fcntl(m_fd_a[1], F_SETFL, O_NONBLOCK), 0);
        const std::string block(4096, 'x');
        while (write(m_fd_a[1], block.data(), block.size()) > 0) {
        }
    }

    int m_fd_a[2];
};

TEST_F(wait_on_pipe, readable)
{
    const auto begin = steady_clock_t::now();
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 40), 0);
    EXPECT_GE(elapsed_ms(begin), 40);
    say("x");
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 30000), 1);
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 0), 1);
}

TEST_F(wait_on_pipe, readable_at_the_end_of_data)
{
    close(m_fd_a[1]);
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 30000), 1);
    char byte = 0;
    errno = EINTR; /* of another call: what did not fail is not tried again */
    EXPECT_EQ(amt_wait_read(m_fd_a[0], &byte, 1), 0);
    m_fd_a[1] = -1;
}

TEST_F(wait_on_pipe, writable)
{
    EXPECT_EQ(amt_wait_writable(m_fd_a[1], 30000), 1);
    fill();
    const auto begin = steady_clock_t::now();
    EXPECT_EQ(amt_wait_writable(m_fd_a[1], 40), 0);
    EXPECT_GE(elapsed_ms(begin), 40);
}

TEST_F(wait_on_pipe, no_descriptor)
{
    for (const int fd : {-1, static_cast<int>(FD_SETSIZE), 1 << 30}) {
        errno = 0;
        EXPECT_EQ(amt_wait_readable(fd, 30000), -1);
        EXPECT_EQ(errno, EBADF);
        errno = 0;
        EXPECT_EQ(amt_wait_writable(fd, 30000), -1);
        EXPECT_EQ(errno, EBADF);
    }
    char byte = 0;
    errno = 0;
    EXPECT_EQ(amt_wait_read(-1, &byte, 1), -1);
    EXPECT_EQ(errno, EBADF);
}

TEST_F(wait_on_pipe, descriptor_0_is_one)
{
    const descriptor_swap_c swap(0, m_fd_a[0]);
    EXPECT_EQ(amt_wait_readable(0, 1), 0);
    say("x");
    EXPECT_EQ(amt_wait_readable(0, 30000), 1);
}

TEST_F(wait_on_pipe, read_takes_what_is_there)
{
    say("abcdef");
    char text_a[8] = {};
    EXPECT_EQ(amt_wait_read(m_fd_a[0], text_a, 4), 4);
    EXPECT_STREQ(text_a, "abcd");
    EXPECT_EQ(amt_wait_read(m_fd_a[0], text_a, 4), 2);
    EXPECT_STREQ(text_a, "efcd");
}

/* While this lives a signal comes every 20 ms, whose handler interrupts system calls. */
class frequent_signal_c {
public:
    explicit frequent_signal_c(void (*handler)(int))
    {
        struct sigaction action = {};
        action.sa_handler = handler;
        EXPECT_EQ(sigaction(SIGALRM, &action, nullptr), 0);
        const itimerval often = {{0, 20000}, {0, 20000}};
        EXPECT_EQ(setitimer(ITIMER_REAL, &often, nullptr), 0);
    }
    ~frequent_signal_c()
    {
        const itimerval never = {};
        setitimer(ITIMER_REAL, &never, nullptr);
        signal(SIGALRM, SIG_DFL);
    }
    frequent_signal_c(const frequent_signal_c &) = delete;
    frequent_signal_c &operator=(const frequent_signal_c &) = delete;
};

volatile sig_atomic_t g_signal_count = 0;
int g_signal_fd = -1;

void count_signal(int)
{
    g_signal_count = g_signal_count + 1;
}

void say_at_the_third_signal(int)
{
    count_signal(SIGALRM);
    if (g_signal_count == 3) {
        const ssize_t ignored = write(g_signal_fd, "y", 1);
        static_cast<void>(ignored);
    }
}

TEST_F(wait_on_pipe, goes_on_after_a_signal)
{
    g_signal_fd = m_fd_a[1];
    g_signal_count = 0;
    const frequent_signal_c signals(say_at_the_third_signal);
    char byte = 0;
    EXPECT_EQ(amt_wait_read(m_fd_a[0], &byte, 1), 1);
    EXPECT_EQ(byte, 'y');
    g_signal_count = 0;
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 30000), 1);
    EXPECT_GE(g_signal_count, 3);
}

TEST_F(wait_on_pipe, takes_its_time_whatever_signals_come)
{
    g_signal_count = 0;
    const frequent_signal_c signals(count_signal);
    const auto begin = steady_clock_t::now();
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 150), 0);
    EXPECT_GE(elapsed_ms(begin), 150);
    EXPECT_LT(elapsed_ms(begin), 5000);
    EXPECT_GE(g_signal_count, 3);
}

std::atomic<bool> g_is_deferred;

void *read_while_deferred(void *fd_ptr)
{
    pub_util_defer_thread_end();
    g_is_deferred = true;
    char byte = 0;
    amt_wait_read(*static_cast<const int *>(fd_ptr), &byte, 1);
    return fd_ptr;
}

TEST_F(wait_on_pipe, may_be_ended_in_a_read_though_its_end_is_deferred)
{
    struct sigaction action = {};
    action.sa_handler = pub_util_handle_thread_signal;
    ASSERT_EQ(sigaction(SIGUSR1, &action, nullptr), 0);
    g_is_deferred = false;
    pthread_t thread = 0;
    ASSERT_EQ(pthread_create(&thread, nullptr, read_while_deferred, &m_fd_a[0]), 0);
    while (!g_is_deferred) {
        sched_yield();
    }
    ASSERT_EQ(pthread_kill(thread, SIGUSR1), 0);
    timespec late = {};
    clock_gettime(CLOCK_REALTIME, &late);
    late.tv_sec += LATE_SECONDS;
    void *returned = nullptr;
    EXPECT_EQ(pthread_timedjoin_np(thread, &returned, &late), 0);
    EXPECT_NE(returned, &m_fd_a[0]);
}

TEST_F(wait_on_pipe, keeps_whether_the_threads_end_is_deferred)
{
    char byte = 0;
    say("xy");
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 1000), 1);
    EXPECT_EQ(amt_wait_read(m_fd_a[0], &byte, 1), 1);
    EXPECT_FALSE(pub_util_is_thread_end_deferred());
    pub_util_defer_thread_end();
    EXPECT_EQ(amt_wait_read(m_fd_a[0], &byte, 1), 1);
    EXPECT_TRUE(pub_util_is_thread_end_deferred());
    EXPECT_EQ(amt_wait_readable(m_fd_a[0], 1), 0);
    EXPECT_EQ(amt_wait_writable(m_fd_a[1], 1), 1);
    EXPECT_TRUE(pub_util_is_thread_end_deferred());
    pub_util_allow_thread_end();
}

} // namespace
