#include "amt/amt-device/device-request.h"
#include "amt/amt-device/embed/embedded-data.h"

#include <set>
#include <string.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/amt/amt-device/radio-library.h"
#include "tests/unit/amt/amt-device/shell-record.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint8_t REQ_ID = 187;
constexpr uint8_t RSP_ID = 188;
constexpr char HANDLER[] = "amt_device_wifi_rtx_test";

/* The atoms of a request and of its answer. */
std::string sub_command(uint8_t value)
{
    return bytes_atom(154, std::string(1, static_cast<char>(value)));
}

std::string channel(uint8_t value)
{
    return bytes_atom(155, std::string(1, static_cast<char>(value)));
}

std::string rate(const std::string &two_bytes)
{
    return bytes_atom(156, two_bytes);
}

std::string power(const std::string &two_bytes)
{
    return bytes_atom(157, two_bytes);
}

std::string ok_packet(uint8_t sub, const std::string &more = "")
{
    return wire_packet(RSP_ID, sub_command(sub) + more + int_atom(1, 0));
}

class wifi_radio : public testing::Test {
protected:
    /* Each test begins with the chip's test mode off. */
    void SetUp() override
    {
        m_library.m_answer = 0;
        request(sub_command(2));
        forget();
    }

    int request(const std::string &atoms)
    {
        return m_line.handle(amt_device_wifi_rtx_test, wire_packet(REQ_ID, atoms));
    }

    void start()
    {
        EXPECT_EQ(request(sub_command(1)), PUB_ERR_NONE);
        forget();
    }

    void forget()
    {
        m_line.app_packets();
        m_library.take_calls();
        m_shell.m_commands.clear();
    }

    /* A request that fails with the error line and this text as the last lines, and no answer. */
    void expect_failure(const std::string &atoms, int code, const std::string &text)
    {
        const log_capture_c capture;
        errno = 0;
        EXPECT_EQ(request(atoms), code);
        std::vector<std::string> lines = without_line_numbers(capture);
        ASSERT_GE(lines.size(), 2U);
        EXPECT_EQ(lines.back(), text);
        EXPECT_EQ(lines[lines.size() - 2], error_line("amt/amt-device", HANDLER, code));
        EXPECT_THAT(m_line.app_packets(), IsEmpty());
    }

    shell_record_c m_shell;
    radio_library_c m_library;
    modem_line_c m_line;
};

TEST_F(wifi_radio, start_and_stop_call_the_library_once)
{
    for (int i = 0; i < 2; i++) {
        EXPECT_EQ(request(sub_command(1)), PUB_ERR_NONE);
    }
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_wifiCtrl(1)"));
    for (int i = 0; i < 2; i++) {
        EXPECT_EQ(request(sub_command(2)), PUB_ERR_NONE);
    }
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_wifiCtrl(0)"));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(ok_packet(1), ok_packet(1), ok_packet(2), ok_packet(2)));
}

TEST_F(wifi_radio, a_failed_start_and_stop_change_nothing)
{
    m_library.m_answer = 5;
    expect_failure(sub_command(1), PUB_ERR_FAIL, "WIFI-start error. call ldt_wifiCtrl fail: 5");
    expect_failure(sub_command(1), PUB_ERR_FAIL, "WIFI-start error. call ldt_wifiCtrl fail: 5");
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_wifiCtrl(1)", "ldt_wifiCtrl(1)"));
    m_library.m_answer = 0;
    start();
    m_library.m_answer = -7;
    expect_failure(sub_command(2), PUB_ERR_FAIL, "WIFI-stop error. call ldt_wifiCtrl fail: -7");
    m_library.m_answer = 0;
    forget();
    EXPECT_EQ(request(sub_command(4)), PUB_ERR_NONE);
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_TxTest(0, 0, 0, 0)"));
}

TEST_F(wifi_radio, logs_the_start_and_the_stop)
{
    {
        const log_capture_c capture;
        request(sub_command(1));
        const std::vector<std::string> texts = capture.texts();
        ASSERT_GE(texts.size(), 3U);
        EXPECT_EQ(texts[0], "amt_device_wifi_rtx_test()");
        EXPECT_EQ(texts[1], "WIFI-start start");
        EXPECT_EQ(texts[2], "WIFI-start end. return:0.");
    }
    const log_capture_c capture;
    request(sub_command(2));
    const std::vector<std::string> texts = capture.texts();
    ASSERT_GE(texts.size(), 3U);
    EXPECT_EQ(texts[1], "WIFI-stop start");
    EXPECT_EQ(texts[2], "WIFI-stop end. return:0.");
}

/* The lines of all failures, with their numbers. */
std::vector<std::string> error_lines(const log_capture_c &capture)
{
    std::vector<std::string> lines;
    for (const std::string &text : capture.texts()) {
        if (text.rfind("FILE-", 0) == 0) {
            lines.push_back(text);
        }
    }
    return lines;
}

TEST_F(wifi_radio, each_missing_parameter_shows_its_own_line)
{
    start();
    const log_capture_c capture;
    errno = 0;
    request(sub_command(3));
    request(sub_command(3) + channel(1));
    request(sub_command(3) + channel(1) + rate("ab"));
    request(sub_command(5));
    request(sub_command(5) + channel(1));
    const std::vector<std::string> lines = error_lines(capture);
    EXPECT_EQ(lines.size(), 5U);
    EXPECT_EQ(std::set<std::string>(lines.begin(), lines.end()).size(), 5U);
}

TEST_F(wifi_radio, nothing_else_runs_while_wifi_is_off)
{
    for (const uint8_t sub : std::initializer_list<uint8_t>{3, 4, 5, 6}) {
        expect_failure(sub_command(sub) + channel(1) + rate("ab") + power("cd"), PUB_ERR_FAIL,
                       "WIFI is not running");
    }
    EXPECT_THAT(m_library.take_calls(), IsEmpty());
}

TEST_F(wifi_radio, numbers_are_little_endian_and_unsigned)
{
    start();
    const log_capture_c capture;
    EXPECT_EQ(request(sub_command(3) + channel(200) + rate("\x26\x02") + power("\xFE\xFF")), PUB_ERR_NONE);
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_TxTest(1, 65534, 550, 200)"));
    EXPECT_TRUE(capture.has("WIFI-TX-start start. channel:200; power:65534; rate:550"));
    EXPECT_TRUE(capture.has("WIFI-TX-start end. return:0."));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(ok_packet(3)));
}

TEST_F(wifi_radio, the_first_missing_number_is_named)
{
    start();
    expect_failure(sub_command(3) + rate("ab") + power("cd"), PUB_ERR_FAIL, "Tx get channel error");
    expect_failure(sub_command(3) + channel(1) + power("cd"), PUB_ERR_FAIL, "Tx get rate error");
    expect_failure(sub_command(3) + channel(1) + rate("ab"), PUB_ERR_FAIL, "Tx get power error");
    expect_failure(sub_command(3), PUB_ERR_FAIL, "Tx get channel error");
    expect_failure(sub_command(5) + rate("ab"), PUB_ERR_FAIL, "Rx get channel error");
    expect_failure(sub_command(5) + channel(1), PUB_ERR_FAIL, "Rx get rate error");
    EXPECT_THAT(m_library.take_calls(), IsEmpty());
}

TEST_F(wifi_radio, transmission_stops)
{
    start();
    const log_capture_c capture;
    EXPECT_EQ(request(sub_command(4)), PUB_ERR_NONE);
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_TxTest(0, 0, 0, 0)"));
    EXPECT_TRUE(capture.has("WIFI-TX-stop start. "));
    EXPECT_TRUE(capture.has("WIFI-TX-stop end. return:0."));
}

TEST_F(wifi_radio, reception_stops_on_the_channel_it_started_on)
{
    start();
    EXPECT_EQ(request(sub_command(5) + channel(11) + rate("\x26\x02")), PUB_ERR_NONE);
    forget();
    m_library.m_answer = 3;
    expect_failure(sub_command(5) + channel(7) + rate("ab"), PUB_ERR_FAIL,
                   "WIFI-RX-start error. call ldt_RxTest fail: 3");
    m_library.m_answer = 0;
    m_library.m_count = 990;
    forget();
    const log_capture_c capture;
    EXPECT_EQ(request(sub_command(6) + channel(5)), PUB_ERR_NONE);
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_RxTest(0, 11, 0, out)"));
    EXPECT_TRUE(capture.has("WIFI-RX-stop start. channel:11"));
    EXPECT_TRUE(capture.has("WIFI-RX-stop end. return:0; cnt:990."));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(ok_packet(6, int_atom(158, 990))));
}

TEST_F(wifi_radio, reception_starts_without_a_counter)
{
    start();
    const log_capture_c capture;
    EXPECT_EQ(request(sub_command(5) + channel(6) + rate(std::string("\x6C\x00", 2))), PUB_ERR_NONE);
    EXPECT_THAT(m_library.take_calls(), ElementsAre("ldt_RxTest(1, 6, 108, null)"));
    EXPECT_TRUE(capture.has("WIFI-RX-start start. channel:6; rate:108"));
}

TEST_F(wifi_radio, library_failures_name_the_call)
{
    start();
    m_library.m_answer = -2;
    expect_failure(sub_command(3) + channel(1) + rate("ab") + power("cd"), PUB_ERR_FAIL,
                   "WIFI-TX-start error. call ldt_TxTest fail: -2");
    expect_failure(sub_command(4), PUB_ERR_FAIL, "WIFI-TX-stop error. call ldt_TxTest fail: -2");
    expect_failure(sub_command(6), PUB_ERR_FAIL, "WIFI-RX-stop error. call ldt_RxTest fail: -2");
}

TEST_F(wifi_radio, an_unknown_sub_command_is_traced_and_refused)
{
    for (const uint8_t sub : std::initializer_list<uint8_t>{0, 7, 255}) {
        forget();
        expect_failure(sub_command(sub), PUB_ERR_PARAM, "unknown operation: " + std::to_string(sub));
        EXPECT_THAT(m_shell.m_commands,
                    ElementsAre(" echo the cmd value received from pc is : " + std::to_string(sub) +
                                    " >> /data/local/wifi/wifi_dbg_file.txt",
                                "echo the subcmd is invalid >> /data/local/wifi/wifi_dbg_file.txt"));
    }
}

TEST_F(wifi_radio, the_sub_command_is_the_first_byte_of_its_atom)
{
    expect_failure("", PUB_ERR_PARAM, "unknown operation: 0");
    expect_failure(bytes_atom(154, ""), PUB_ERR_PARAM, "unknown operation: 0");
    expect_failure(int_atom(154, 0x0107), PUB_ERR_PARAM, "unknown operation: 7");
    EXPECT_EQ(request(int_atom(154, 0x0101)), PUB_ERR_NONE);
    EXPECT_THAT(m_line.app_packets(), ElementsAre(ok_packet(1)));
}

TEST_F(wifi_radio, the_pc_gets_an_envelope)
{
    EXPECT_EQ(m_line.handle(amt_device_wifi_rtx_test, wire_packet(REQ_ID, sub_command(2)), AMT_CHANNEL_PC),
              PUB_ERR_NONE);
    const std::vector<std::string> frames = m_line.pc_frames();
    ASSERT_EQ(frames.size(), 1U);
    EXPECT_EQ(frames[0].substr(12, frames[0].size() - 16), ok_packet(2));
}

TEST(wifi_script, the_image_carries_the_whole_script)
{
    const std::string text = g_wifi_radio_test_script_a;
    EXPECT_EQ(text.find("#!/system/bin/sh\n"), 0U);
    EXPECT_EQ(text.rfind("exit 0\n"), text.size() - strlen("exit 0\n"));
    size_t position = 0;
    for (const char *mark : {"startWifiTxFunc()", "stopWifiTxFunc()", "startWifiRxFunc()", "stopWifiRxFunc()",
                             "WL_PATH=/system/bin/wl"})
    {
        position = text.find(mark, position);
        ASSERT_NE(position, std::string::npos) << mark;
    }
}

} // namespace
