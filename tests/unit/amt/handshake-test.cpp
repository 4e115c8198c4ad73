#include "amt/amt-handle/handshake.h"

#include <atomic>
#include <errno.h>
#include <signal.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/handshake-permission.h"
#include "pub/error.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

/* The id that the log shows behind these words, "" when it shows none. */
std::string shown_id(const log_capture_c &capture, const std::string &words)
{
    for (const std::string &text : capture.texts()) {
        const size_t found = text.find(words);
        if (found != std::string::npos) {
            const size_t begin = found + words.size();
            return text.substr(begin, text.find_first_not_of("-0123456789", begin) - begin);
        }
    }
    return "";
}

/* A USB-inserted start whose permission has been given. */
class handshake : public testing::Test {
protected:
    void SetUp() override
    {
        g_usb_activate = 1;
        EXPECT_EQ(amt_handshake_ask_permission(), PUB_ERR_NONE);
    }
    void TearDown() override
    {
        amt_handshake_end();
        g_usb_activate = 0;
    }
};

TEST_F(handshake, unknown_switch_operation_is_refused)
{
    const log_capture_c capture;
    int flag = 77;
    errno = 0;
    EXPECT_EQ(handle_amt_damt1_operation(3, &flag), PUB_ERR_PARAM);
    EXPECT_EQ(handle_amt_damt1_operation(-1, &flag), PUB_ERR_PARAM);
    EXPECT_EQ(flag, 77);
    const std::string failed = error_line("amt/amt-handle", "handle_amt_damt1_operation", -101);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{failed, "unknown operation type: 3", failed, "unknown operation type: 4294967295"}));
}

TEST_F(handshake, has_two_time_limits)
{
    const log_capture_c capture;
    amt_handshake_begin();
    const std::string link_id = shown_id(capture, "createTimer success, timerId[");
    EXPECT_EQ(capture.texts(), (texts_t{"createTimer success, timerId[" + link_id + "]",
                                        "setTimer success, timerId[" + link_id + "], timeMSec:20000. "}));
    const log_capture_c link_capture;
    amt_handshake_link_up();
    EXPECT_EQ(link_capture.texts(),
              (texts_t{"delete timer.timerId:" + link_id + ".", "deleteTimer success, timerId[-1]"}));
    const log_capture_c data_capture;
    amt_handshake_modem_data();
    const std::string data_id = shown_id(data_capture, "createTimer success, timerId[");
    EXPECT_EQ(data_capture.texts(),
              (texts_t{"will create timer.", "createTimer success, timerId[" + data_id + "]",
                       "setTimer success, timerId[" + data_id + "], timeMSec:5000. "}));
    /* The time runs once. */
    const log_capture_c later_capture;
    amt_handshake_modem_data();
    EXPECT_EQ(later_capture.texts(), texts_t{});
}

TEST_F(handshake, succeeds_once_with_data_while_the_time_runs)
{
    amt_handshake_begin();
    EXPECT_FALSE(amt_handshake_pc_data()); /* the link is up, but nothing runs yet */
    amt_handshake_modem_data();
    const log_capture_c capture;
    EXPECT_TRUE(amt_handshake_pc_data());
    const std::string id = shown_id(capture, "delete timer.timerId:");
    EXPECT_EQ(capture.texts(), (texts_t{"delete timer.timerId:" + id + ".",
                                        "deleteTimer success, timerId[-1]", "handshake success."}));
    const log_capture_c later_capture;
    amt_handshake_modem_data();
    EXPECT_FALSE(amt_handshake_pc_data());
    EXPECT_EQ(later_capture.texts(), texts_t{});
}

TEST_F(handshake, needs_the_link)
{
    amt_handshake_link_up();
    amt_handshake_link_down();
    const log_capture_c capture;
    amt_handshake_modem_data(); /* the platform's file does not say that it is up */
    EXPECT_EQ(capture.count_containing("will create timer."), 0);
}

TEST_F(handshake, that_is_over_times_nothing)
{
    amt_handshake_link_up();
    amt_handshake_end();
    const log_capture_c capture;
    amt_handshake_modem_data();
    EXPECT_FALSE(amt_handshake_pc_data());
    EXPECT_EQ(capture.texts(), texts_t{});
}

TEST_F(handshake, is_none_of_another_start)
{
    g_usb_activate = 0;
    const log_capture_c capture;
    EXPECT_EQ(amt_handshake_ask_permission(), PUB_ERR_NONE);
    amt_handshake_begin();
    amt_handshake_modem_data();
    EXPECT_FALSE(amt_handshake_pc_data());
    EXPECT_EQ(capture.texts(), texts_t{});
    /* The USB monitor of every start follows the link. */
    amt_handshake_link_up();
    EXPECT_EQ(capture.texts(), texts_t{"deleteTimer success, timerId[-1]"});
}

/* Whatever the modem's words and the station's data meet in: no timer outlives a handshake that succeeded. */
TEST_F(handshake, leaves_no_timer_behind_when_its_sides_meet)
{
    for (int i = 0; i < 100; i++) {
        EXPECT_EQ(amt_handshake_ask_permission(), PUB_ERR_NONE);
        amt_handshake_link_up();
        const log_capture_c capture;
        std::atomic<bool> is_done{false};
        std::thread modem([&] {
            while (!is_done) {
                amt_handshake_modem_data();
            }
            amt_handshake_modem_data();
        });
        while (!amt_handshake_pc_data()) {
        }
        is_done = true;
        modem.join();
        EXPECT_EQ(capture.count_containing("createTimer success"), 1);
        EXPECT_EQ(capture.count_containing("setTimer success"), 1);
        EXPECT_EQ(capture.count_containing("delete timer."), 1);
        EXPECT_EQ(capture.texts().back(), "handshake success.");
    }
}

volatile sig_atomic_t g_is_ended = 0;

TEST_F(handshake, failed_ends_the_process_by_a_signal)
{
    signal(SIGTERM, [](int) { g_is_ended = 1; });
    amt_handshake_link_up();
    amt_handshake_modem_data();
    const log_capture_c capture;
    amt_handle_exit_by_handshake();
    for (int i = 0; i < 1000 && g_is_ended == 0; i++) {
        usleep(1000);
    }
    EXPECT_EQ(g_is_ended, 1);
    signal(SIGTERM, SIG_DFL);
    const std::string id = shown_id(capture, "delete timer.timerId:");
    EXPECT_NE(id, "");
    const texts_t wanted = {"permit to enter amt by handshake. ",
                            "set property(sys.vx.amt.failure.handshake) to 2.",
                            "deleteTimer success, timerId[-1]", "delete timer.timerId:" + id + ".",
                            "deleteTimer success, timerId[-1]"};
    const texts_t text_list = capture.texts();
    ASSERT_GE(text_list.size(), wanted.size());
    EXPECT_EQ(texts_t(text_list.end() - static_cast<long>(wanted.size()), text_list.end()), wanted);
    /* The property is set once a process. */
    const log_capture_c end_capture;
    amt_handshake_end();
    EXPECT_EQ(end_capture.count_containing("set property"), 0);
}

} // namespace
