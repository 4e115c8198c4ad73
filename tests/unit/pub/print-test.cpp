#include "pub/log/print.h"

#include <algorithm>
#include <atomic>
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdint.h>
#include <string>
#include <sys/time.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/unit/support/descriptor-swap.h"

namespace {

constexpr int PIPE_SIZE = 4096;
constexpr int ALARM_COUNT = 3;

std::atomic<int> g_alarm_count{0};
std::atomic<size_t> g_most_written{SIZE_MAX}; /* by one write to standard output */

void count_alarm(int)
{
    g_alarm_count++;
}

/* Interrupts the thread that makes it every few milliseconds while it lives; those made meanwhile are spared. */
class alarms_c {
public:
    alarms_c()
    {
        g_alarm_count = 0;
        struct sigaction action = {};
        action.sa_handler = count_alarm; /* no SA_RESTART: a waiting write ends */
        sigaction(SIGALRM, &action, &m_saved_action);
        set(5000);
    }
    ~alarms_c()
    {
        set(0);
        sigaction(SIGALRM, &m_saved_action, nullptr);
    }
    alarms_c(const alarms_c &) = delete;
    alarms_c &operator=(const alarms_c &) = delete;

private:
    static void set(suseconds_t us)
    {
        const itimerval value = {{0, us}, {0, us}};
        setitimer(ITIMER_REAL, &value, nullptr);
    }

    struct sigaction m_saved_action = {};
};

/* A thread that takes no alarm. */
template <typename body_t> std::thread start_spared(body_t body)
{
    sigset_t alarm;
    sigemptyset(&alarm);
    sigaddset(&alarm, SIGALRM);
    pthread_sigmask(SIG_BLOCK, &alarm, nullptr);
    std::thread thread(body);
    pthread_sigmask(SIG_UNBLOCK, &alarm, nullptr);
    return thread;
}

class print : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_EQ(pipe(m_pipe_a), 0);
    }
    void TearDown() override
    {
        close(m_pipe_a[0]);
        close(m_pipe_a[1]);
    }
    /* What is in the pipe now; the caller has written something. */
    std::string take() const
    {
        char buf_a[16384];
        const ssize_t count = read(m_pipe_a[0], buf_a, sizeof(buf_a));
        return {buf_a, static_cast<size_t>(count > 0 ? count : 0)};
    }

    int m_pipe_a[2] = {-1, -1};
};

} // namespace

TEST_F(print, text_is_in_the_pipe_at_once)
{
    const descriptor_swap_c swap(STDOUT_FILENO, m_pipe_a[1]);
    pub_print("no line end yet: %d", 5);
    EXPECT_EQ(take(), "no line end yet: 5");
    pub_print("%s", "one line\n");
    EXPECT_EQ(take(), "one line\n");
    pub_print("%c", 'x');
    EXPECT_EQ(take(), "x");
}

TEST_F(print, long_text_is_cut_at_4607_bytes)
{
    const descriptor_swap_c swap(STDOUT_FILENO, m_pipe_a[1]);
    pub_print("%s", std::string(4607, 'a').c_str());
    EXPECT_EQ(take(), std::string(4607, 'a'));
    pub_print("%s", std::string(4608, 'b').c_str());
    EXPECT_EQ(take(), std::string(4607, 'b'));
}

TEST_F(print, text_is_whole_though_its_writes_are_interrupted)
{
    if (fcntl(m_pipe_a[1], F_SETPIPE_SZ, PIPE_SIZE) != PIPE_SIZE) {
        GTEST_SKIP() << "no pipe of " << PIPE_SIZE << " bytes";
    }
    std::string text;
    for (int i = 0; text.size() < PIPE_SIZE + 400; i++) {
        text += std::to_string(i) + " ";
    }
    std::string taken;
    std::thread reader = start_spared([&] {
        while (g_alarm_count < ALARM_COUNT) {
            std::this_thread::yield();
        }
        for (std::string piece = take(); !piece.empty(); piece = take()) {
            taken += piece;
        }
    });
    {
        const descriptor_swap_c swap(STDOUT_FILENO, m_pipe_a[1]);
        const alarms_c alarms;
        pub_print("%s", text.c_str());
    }
    EXPECT_GE(g_alarm_count, ALARM_COUNT);
    g_alarm_count = ALARM_COUNT; /* the reader must not wait where nobody was interrupted */
    close(m_pipe_a[1]);
    m_pipe_a[1] = -1;
    reader.join();
    EXPECT_EQ(taken, text);
}

TEST_F(print, goes_on_where_a_single_byte_was_taken)
{
    const descriptor_swap_c swap(STDOUT_FILENO, m_pipe_a[1]);
    g_most_written = 1;
    pub_print("whole");
    g_most_written = SIZE_MAX;
    EXPECT_EQ(take(), "whole");
}

TEST_F(print, errno_survives_a_closed_output)
{
    const descriptor_swap_c swap(STDOUT_FILENO, -1);
    errno = EXDEV;
    pub_print("lost");
    EXPECT_EQ(errno, EXDEV);
}

TEST_F(print, empty_text_writes_nothing)
{
    const descriptor_swap_c swap(STDOUT_FILENO, m_pipe_a[1]);
    pub_print("%s", "");
    pub_print("next");
    EXPECT_EQ(take(), "next");
}

extern "C" ssize_t write(int fd, const void *data, size_t size)
{
    using write_func = ssize_t (*)(int, const void *, size_t);
    static const write_func next = reinterpret_cast<write_func>(dlsym(RTLD_NEXT, "write"));
    return next(fd, data, fd == STDOUT_FILENO ? std::min(size, g_most_written.load()) : size);
}
