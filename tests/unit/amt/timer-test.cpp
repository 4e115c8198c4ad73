#include "amt/amt-handle/channel/timer.h"

#include <atomic>
#include <sys/resource.h>
#include <time.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/unit/support/log-capture.h"

namespace {

using texts_t = std::vector<std::string>;

std::atomic<int> g_fired{0};
std::atomic<int> g_value{0};

void count_time_out(sigval value)
{
    g_value = value.sival_int;
    g_fired++;
}

std::string shown_id(const amt_timer_st &timer)
{
    return std::to_string(static_cast<int>(timer.m_id.load()));
}

itimerspec get_time(const amt_timer_st &timer)
{
    itimerspec time = {};
    /* NOLINTNEXTLINE(performance-no-int-to-ptr): the kernel counts them */
    EXPECT_EQ(timer_gettime(reinterpret_cast<timer_t>(timer.m_id.load()), &time), 0);
    return time;
}

class timer : public testing::Test {
protected:
    void SetUp() override
    {
        g_fired = 0;
        alarm(30);
    }
    void TearDown() override
    {
        amt_timer_delete(&m_timer);
        alarm(0);
    }

    amt_timer_st m_timer;
};

TEST_F(timer, unarmed_is_not_deleted)
{
    const log_capture_c capture;
    amt_timer_delete(&m_timer);
    EXPECT_EQ(capture.texts(), texts_t{"deleteTimer success, timerId[-1]"});
}

TEST_F(timer, unarmed_cannot_be_set)
{
    const log_capture_c capture;
    amt_timer_set(&m_timer, 5000);
    EXPECT_EQ(capture.texts(), texts_t{"invalid parameter.timerId:-1; timeMSec:5000."});
    EXPECT_EQ(m_timer.m_id, -1);
}

TEST_F(timer, is_created_set_and_deleted)
{
    const log_capture_c capture;
    amt_timer_create(&m_timer, count_time_out);
    const std::string id = shown_id(m_timer);
    ASSERT_NE(m_timer.m_id, -1);
    const itimerspec before = get_time(m_timer);
    EXPECT_EQ(before.it_value.tv_sec, 0);
    EXPECT_EQ(before.it_value.tv_nsec, 0);
    amt_timer_set(&m_timer, 20000);
    amt_timer_delete(&m_timer);
    EXPECT_EQ(m_timer.m_id, -1);
    EXPECT_EQ(capture.texts(),
              (texts_t{"createTimer success, timerId[" + id + "]",
                       "setTimer success, timerId[" + id + "], timeMSec:20000. ",
                       "delete timer.timerId:" + id + ".", "deleteTimer success, timerId[-1]"}));
}

TEST_F(timer, takes_milliseconds_apart)
{
    amt_timer_create(&m_timer, count_time_out);
    for (const int wanted_ms : {1500, 5000}) {
        amt_timer_set(&m_timer, wanted_ms);
        const itimerspec time = get_time(m_timer);
        EXPECT_EQ(time.it_interval.tv_sec, 0);
        EXPECT_EQ(time.it_interval.tv_nsec, 0);
        const long left_ms = time.it_value.tv_sec * 1000 + time.it_value.tv_nsec / 1000000;
        EXPECT_GT(left_ms, wanted_ms - 1000);
        EXPECT_LE(left_ms, wanted_ms);
    }
}

TEST_F(timer, fires_once)
{
#ifdef __SANITIZE_THREAD__
    GTEST_SKIP() << "the sanitizer does not know the C library's timer threads";
#endif
    amt_timer_create(&m_timer, count_time_out);
    amt_timer_set(&m_timer, 5);
    while (g_fired == 0) {
        usleep(1000);
    }
    usleep(30000);
    EXPECT_EQ(g_fired, 1);
    EXPECT_EQ(g_value, 111);
    /* It is there still, and can be set again. */
    EXPECT_NE(m_timer.m_id, -1);
    amt_timer_set(&m_timer, 1);
    while (g_fired == 1) {
        usleep(1000);
    }
}

TEST_F(timer, deleted_in_time_does_not_fire)
{
    amt_timer_create(&m_timer, count_time_out);
    amt_timer_set(&m_timer, 50);
    amt_timer_delete(&m_timer);
    usleep(80000);
    EXPECT_EQ(g_fired, 0);
}

TEST_F(timer, created_again_replaces_the_first)
{
    amt_timer_create(&m_timer, count_time_out);
    amt_timer_set(&m_timer, 50);
    const std::string first = shown_id(m_timer);
    const log_capture_c capture;
    amt_timer_create(&m_timer, count_time_out);
    EXPECT_EQ(capture.texts(),
              (texts_t{"delete timer.timerId:" + first + ".", "deleteTimer success, timerId[-1]",
                       "createTimer success, timerId[" + shown_id(m_timer) + "]"}));
    usleep(80000);
    EXPECT_EQ(g_fired, 0);
}

TEST_F(timer, refused_time_is_logged)
{
    amt_timer_create(&m_timer, count_time_out);
    const std::string id = shown_id(m_timer);
    const log_capture_c capture;
    amt_timer_set(&m_timer, -5000);
    EXPECT_EQ(capture.texts(), (texts_t{"timer_settime errorr: 22 - Invalid argument",
                                        "setTimer success, timerId[" + id + "], timeMSec:-5000. "}));
}

TEST_F(timer, refused_creation_is_logged)
{
    const auto create_without_room = [this] {
        const rlimit none = {0, 0};
        if (setrlimit(RLIMIT_SIGPENDING, &none) != 0) {
            _exit(2);
        }
        const log_capture_c capture;
        amt_timer_create(&m_timer, count_time_out);
        const bool is_logged =
            capture.texts() == texts_t{"timer_create, error: 11 - Resource temporarily unavailable"};
        _exit(is_logged && m_timer.m_id == -1 ? 0 : 1);
    };
    EXPECT_EXIT(create_without_room(), testing::ExitedWithCode(0), "");
}

} // namespace
