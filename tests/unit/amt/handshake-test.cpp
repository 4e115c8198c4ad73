#include "amt/amt-handle/channel/handshake.h"

#include <errno.h>
#include <signal.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

std::string shown_id(const amt_timer_st &timer)
{
    return std::to_string(static_cast<int>(timer.m_id.load()));
}

class handshake : public testing::Test {
protected:
    void TearDown() override
    {
        amt_timer_delete(&g_handshake_state.m_usb_enum_timer);
        amt_timer_delete(&g_handshake_state.m_handshake_timer);
        g_handshake_state.m_is_ac_power = 0;
        g_handshake_state.m_is_property_set = 0;
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
    amt_handshake_start_usb_enum_timer();
    amt_handshake_start_timer();
    const std::string enum_id = shown_id(g_handshake_state.m_usb_enum_timer);
    const std::string data_id = shown_id(g_handshake_state.m_handshake_timer);
    EXPECT_NE(enum_id, "-1");
    EXPECT_NE(data_id, enum_id);
    EXPECT_EQ(capture.texts(), (texts_t{"createTimer success, timerId[" + enum_id + "]",
                                        "setTimer success, timerId[" + enum_id + "], timeMSec:20000. ",
                                        "createTimer success, timerId[" + data_id + "]",
                                        "setTimer success, timerId[" + data_id + "], timeMSec:5000. "}));
}

TEST_F(handshake, of_ac_power_says_so)
{
    g_handshake_state.m_is_ac_power = 1;
    const log_capture_c capture;
    amt_set_handshake_property();
    EXPECT_EQ(capture.texts(), (texts_t{"do not permit to enter amt by handshake. ",
                                        "set property(sys.vx.amt.failure.handshake) to 1."}));
}

volatile sig_atomic_t g_is_ended = 0;

TEST_F(handshake, failed_ends_the_process_by_a_signal)
{
    signal(SIGTERM, [](int) { g_is_ended = 1; });
    g_handshake_state.m_is_ac_power = 1; /* so that no file is read */
    amt_handshake_start_timer();
    const std::string id = shown_id(g_handshake_state.m_handshake_timer);
    const log_capture_c capture;
    amt_handle_exit_by_handshake();
    for (int i = 0; i < 1000 && g_is_ended == 0; i++) {
        usleep(1000);
    }
    EXPECT_EQ(g_is_ended, 1);
    signal(SIGTERM, SIG_DFL);
    EXPECT_EQ(g_handshake_state.m_is_property_set, 1);
    EXPECT_EQ(g_handshake_state.m_handshake_timer.m_id, -1);
    EXPECT_EQ(capture.texts(),
              (texts_t{"do not permit to enter amt by handshake. ",
                       "set property(sys.vx.amt.failure.handshake) to 1.", "deleteTimer success, timerId[-1]",
                       "delete timer.timerId:" + id + ".", "deleteTimer success, timerId[-1]"}));
}

} // namespace
