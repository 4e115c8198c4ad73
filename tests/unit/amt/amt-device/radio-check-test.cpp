#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "amt/amt-device/device-request.h"
#include "amt/amt-gps.h"
#include "pub/error.h"
#include "tests/unit/amt/amt-device/radio-library.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

/* What the radio requests do without their address files. */
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/* A request whose whole log is known; on success its response's lines follow. */
void expect_start_of_log(const log_capture_c &capture, const std::vector<std::string> &expected)
{
    const std::vector<std::string> lines = without_line_numbers(capture);
    ASSERT_GE(lines.size(), expected.size());
    EXPECT_EQ(std::vector<std::string>(lines.begin(), lines.begin() + static_cast<long>(expected.size())),
              expected);
}

class radio_check : public testing::Test {
protected:
    int request(amt_handle_func handler, uint8_t id, const std::string &atoms)
    {
        errno = 0;
        return m_line.handle(handler, wire_packet(id, atoms));
    }

    radio_library_c m_library;
    modem_line_c m_line;
};

class bt_address : public radio_check {};
class wifi_address : public radio_check {};
class gps : public radio_check {};

TEST_F(bt_address, checks_the_hardware)
{
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_bt_address, 172, int_atom(110, 3)), PUB_ERR_NONE);
    EXPECT_THAT(m_library.m_calls, ElementsAre("ldt_btCheck()"));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(wire_packet(173, int_atom(1, 0))));
    expect_start_of_log(capture, {"amt_device_bt_address()", "amt_device_bt_address op_type:3",
                                  "BT hardware check start", "BT hardware check end. return:0."});
}

TEST_F(bt_address, tells_a_failed_check)
{
    m_library.m_answer = 4;
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_bt_address, 172, int_atom(110, 3)), PUB_ERR_FAIL);
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre("amt_device_bt_address()", "amt_device_bt_address op_type:3",
                            "BT hardware check start", "BT hardware check end. return:4.",
                            error_line("amt/amt-device", "amt_device_bt_address", PUB_ERR_FAIL),
                            "BT hardware check error. call ldt_btCheck fail: 4"));
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

TEST_F(bt_address, refuses_other_operations)
{
    for (const int32_t operation : {0, 4, -1}) {
        const log_capture_c capture;
        EXPECT_EQ(request(amt_device_bt_address, 172, int_atom(110, operation)), PUB_ERR_PARAM);
        EXPECT_EQ(capture.texts().back(), "unknown operation: " + std::to_string(operation));
    }
    EXPECT_EQ(request(amt_device_bt_address, 172, ""), PUB_ERR_PARAM);
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

TEST_F(bt_address, a_missing_file_is_a_bad_request)
{
    constexpr char path[] = "/amt/BT/BT_Address.txt";
    if (access(path, F_OK) == 0) {
        GTEST_SKIP() << "this machine has " << path;
    }
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_bt_address, 172, int_atom(110, 1)), PUB_ERR_PARAM);
    const std::vector<std::string> lines = without_line_numbers(capture);
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_EQ(lines[2], error_line("amt/amt-device", "amt_device_bt_address", PUB_ERR_FILE, ENOENT));
    EXPECT_EQ(lines[3], "open(\"/amt/BT/BT_Address.txt\") fail: 2 - No such file or directory");
}

TEST_F(wifi_address, checks_the_connectivity)
{
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_wifi_address, 185, int_atom(152, 2)), PUB_ERR_NONE);
    EXPECT_THAT(m_library.m_calls, ElementsAre("ldt_wifiCheck()"));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(wire_packet(186, int_atom(1, 0))));
    expect_start_of_log(capture, {"amt_device_wifi_address()", "amt_device_wifi_address op_type:2",
                                  "wifi connectivity check start", "wifi connectivity check end. return:0."});
}

TEST_F(wifi_address, a_failed_check_names_the_bluetooth_call)
{
    m_library.m_answer = -1;
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_wifi_address, 185, int_atom(152, 2)), PUB_ERR_FAIL);
    EXPECT_EQ(capture.texts().back(), "wifi connectivity check error. call ldt_btCtrl fail: -1");
}

TEST_F(wifi_address, refuses_other_operations)
{
    for (const int32_t operation : {3, 255, -1}) {
        const log_capture_c capture;
        EXPECT_EQ(request(amt_device_wifi_address, 185, int_atom(152, operation)), PUB_ERR_PARAM);
        EXPECT_EQ(capture.texts().back(), "unknown operation: " + std::to_string(operation));
    }
    EXPECT_THAT(m_library.m_calls, IsEmpty());
}

TEST_F(wifi_address, a_write_without_an_address_fails)
{
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_wifi_address, 185, int_atom(152, 1)), PUB_ERR_FAIL);
    EXPECT_EQ(capture.texts().back(), "write error");
    EXPECT_EQ(capture.count_containing("FUNC-amt_device_wifi_address(), error_code=-100"), 1);
}

TEST_F(gps, stops_checks_and_starts)
{
    EXPECT_EQ(request(amt_gps_control, 174, int_atom(140, 0)), PUB_ERR_NONE);
    EXPECT_EQ(request(amt_gps_control, 174, int_atom(140, 1)), PUB_ERR_NONE);
    EXPECT_EQ(request(amt_gps_control, 174, int_atom(140, 2)), PUB_ERR_NONE);
    EXPECT_EQ(request(amt_gps_control, 174, ""), PUB_ERR_NONE);
    EXPECT_THAT(m_library.m_calls,
                ElementsAre("ldt_gpsCtrl(0, 0, null, null)", "ldt_gpsCtrl(1, 0, null, null)",
                            "ldt_gpsCheck()", "ldt_gpsCtrl(0, 0, null, null)"));
    const std::string ok = wire_packet(175, int_atom(1, 0));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(ok, ok, ok, ok));
}

TEST_F(gps, an_unknown_operation_starts)
{
    for (const int32_t operation : {3, 5, -1}) {
        const log_capture_c capture;
        EXPECT_EQ(request(amt_gps_control, 174, int_atom(140, operation)), PUB_ERR_NONE);
        expect_start_of_log(capture,
                            {"amt_gps_control()", "amt_gps_control is_start:" + std::to_string(operation),
                             "GPS-start start", "GPS-start end. return:0."});
        EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_gpsCtrl(1, 0, null, null)"));
    }
}

TEST_F(gps, failures_name_the_call)
{
    m_library.m_answer = 9;
    const struct
    {
        int32_t m_operation;
        const char *m_title_ptr;
        const char *m_call_ptr;
    } row_a[] = {{0, "GPS stop", "ldt_gpsCtrl"},
                 {1, "GPS-start", "ldt_gpsCtrl"},
                 {2, "GPS connectivity check", "ldt_gpsCheck"}};
    for (const auto &row : row_a) {
        const log_capture_c capture;
        const std::string title = row.m_title_ptr;
        EXPECT_EQ(request(amt_gps_control, 174, int_atom(140, row.m_operation)), PUB_ERR_FAIL);
        EXPECT_THAT(without_line_numbers(capture),
                    ElementsAre("amt_gps_control()",
                                "amt_gps_control is_start:" + std::to_string(row.m_operation),
                                title + " start", title + " end. return:9.",
                                error_line("amt/amt-gps", "amt_gps_control", PUB_ERR_FAIL),
                                title + " error. call " + row.m_call_ptr + " fail: 9"));
    }
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

TEST_F(gps, the_test_answers_with_the_id_of_the_control)
{
    EXPECT_EQ(request(amt_gps_test, 176, ""), PUB_ERR_NONE);
    EXPECT_THAT(m_library.m_calls, IsEmpty());
    EXPECT_THAT(m_line.app_packets(), ElementsAre(wire_packet(175, int_atom(1, 0))));
}

TEST_F(gps, reads_a_signal)
{
    m_library.m_svid = 31;
    m_library.m_cnr = -4;
    const log_capture_c capture;
    EXPECT_EQ(request(amt_gps_read_result, 178, int_atom(141, 7)), PUB_ERR_NONE);
    EXPECT_THAT(m_library.m_calls, ElementsAre("ldt_gpsCtrl(2, 7, out, out)"));
    EXPECT_THAT(m_line.app_packets(),
                ElementsAre(wire_packet(179, int_atom(144, -4) + int_atom(141, 31) + int_atom(1, 0))));
    expect_start_of_log(capture, {"amt_gps_read_result()", "GPS-READ-SIGNAL start. index:7",
                                  "GPS-READ-SIGNAL end. return:0; svid:31; cnr:-4."});
}

TEST_F(gps, tells_an_unread_signal)
{
    m_library.m_answer = 1;
    const log_capture_c capture;
    EXPECT_EQ(request(amt_gps_read_result, 178, ""), PUB_ERR_FAIL);
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre("amt_gps_read_result()", "GPS-READ-SIGNAL start. index:0",
                            "GPS-READ-SIGNAL end. return:1; svid:0; cnr:0.",
                            error_line("amt/amt-gps", "amt_gps_read_result", PUB_ERR_FAIL),
                            "GPS-READ-SIGNAL error. call ldt_gpsCtrl fail: 1"));
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

/* The PC's envelope is the handler's result; that nobody could be sent the answer is not. */
TEST_F(gps, an_unsent_signal_is_no_failure)
{
    amt_buf_st req = {};
    req.m_buf_len = 6;
    amt_buf_st rsp = {};
    const std::string packet = wire_packet(178, "");
    packet.copy(reinterpret_cast<char *>(req.m_buf_a), AMT_PACKET_SIZE);
    EXPECT_EQ(m_line.handle(amt_gps_read_result, packet, AMT_CHANNEL_PC), PUB_ERR_NONE);
    EXPECT_EQ(m_line.pc_frames().size(), 1U);
    constexpr uint32_t channel_without_a_line = 256;
    EXPECT_EQ(amt_gps_read_result(channel_without_a_line, &req, &rsp), PUB_ERR_NONE);
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

} // namespace
