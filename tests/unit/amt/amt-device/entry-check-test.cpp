#include <ostream>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "amt/amt-device/device-request.h"
#include "amt/amt-gps.h"
#include "amt/amt-handle/request/modem-value.h"
#include "pub/error.h"
#include "tests/unit/amt/amt-device/radio-library.h"
#include "tests/unit/amt/amt-device/shell-record.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

namespace {

struct handler_st
{
    const char *m_name_ptr;
    amt_handle_func m_func;
    const char *m_source_ptr;
};

std::ostream &operator<<(std::ostream &stream, const handler_st &handler)
{
    return stream << handler.m_name_ptr;
}

#define DEVICE_HANDLER(name)                                                                                 \
    handler_st                                                                                               \
    {                                                                                                        \
#name, name, "amt/amt-device"                                                                        \
    }
#define GPS_HANDLER(name)                                                                                    \
    handler_st                                                                                               \
    {                                                                                                        \
#name, name, "amt/amt-gps"                                                                           \
    }

class entry_check : public testing::TestWithParam<handler_st> {};

/* What a refused call logs: the GPS test alone says nothing of its entry. */
void expect_refused(const handler_st &handler, uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr,
                    const std::string &flags)
{
    const shell_record_c shell;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(handler.m_func(channel, req_ptr, rsp_ptr), PUB_ERR_PARAM);
    const std::string name = handler.m_name_ptr;
    std::vector<std::string> expected;
    if (name != "amt_gps_test") {
        expected.push_back(name + "()");
    }
    expected.push_back(error_line(handler.m_source_ptr, name, PUB_ERR_PARAM));
    expected.push_back(flags);
    EXPECT_EQ(without_line_numbers(capture), expected);
    for (const log_record_st &record : capture.records()) {
        EXPECT_EQ(record.m_priority, 3);
        EXPECT_EQ(record.m_tag, "vx-kel-amt");
    }
    const bool leaves_trace = name == "amt_gps_read_result";
    EXPECT_EQ(shell.m_commands.size(), leaves_trace ? 1U : 0U);
    if (leaves_trace) {
        EXPECT_EQ(shell.m_commands[0],
                  "echo gps read result:invalid param > /data/local/wifi/gps_get_result.txt");
    }
}

TEST_P(entry_check, refuses_bad_arguments)
{
    radio_library_c library;
    const modem_line_c line;
    amt_buf_st req = {};
    amt_buf_st empty = {};
    amt_buf_st rsp = {};
    req.m_buf_len = 6;
    expect_refused(GetParam(), AMT_CHANNEL_NONE, &req, &rsp, "1, 0, 0, 0");
    expect_refused(GetParam(), AMT_CHANNEL_APP, &empty, &rsp, "0, 0, 1, 0");
    expect_refused(GetParam(), AMT_CHANNEL_PC, &req, nullptr, "0, 0, 0, 1");
    EXPECT_TRUE(line.app_packets().empty());
    EXPECT_TRUE(line.pc_frames().empty());
    EXPECT_TRUE(library.take_calls().empty());
}

TEST_P(entry_check, refuses_a_missing_request)
{
    const shell_record_c shell;
    amt_buf_st rsp = {};
    const log_capture_c capture;
    EXPECT_EQ(GetParam().m_func(AMT_CHANNEL_APP, nullptr, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back().substr(0, 4), "0, 1");
}

INSTANTIATE_TEST_SUITE_P(
    handlers, entry_check,
    testing::Values(DEVICE_HANDLER(amt_device_battery_voltage),
                    DEVICE_HANDLER(amt_device_battery_voltage_check),
                    DEVICE_HANDLER(amt_device_lcd_brightness), DEVICE_HANDLER(amt_device_button_backlight),
                    DEVICE_HANDLER(amt_device_vibrator), DEVICE_HANDLER(amt_device_tf_card),
                    DEVICE_HANDLER(amt_device_audio), DEVICE_HANDLER(amt_device_audio_loop),
                    DEVICE_HANDLER(amt_device_bt), DEVICE_HANDLER(amt_device_bt_address),
                    DEVICE_HANDLER(amt_device_wifi_address), DEVICE_HANDLER(amt_device_wifi_rtx_test),
                    DEVICE_HANDLER(amt_device_camera), DEVICE_HANDLER(amt_device_camera_control),
                    DEVICE_HANDLER(amt_at_to_modem), DEVICE_HANDLER(amt_read_dev_info),
                    DEVICE_HANDLER(amt_enter_idle), DEVICE_HANDLER(amt_device_emmc_info),
                    DEVICE_HANDLER(amt_device_lcd_color), GPS_HANDLER(amt_gps_control),
                    GPS_HANDLER(amt_gps_test), GPS_HANDLER(amt_gps_read_result)));

} // namespace
