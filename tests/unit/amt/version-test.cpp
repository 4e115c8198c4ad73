#include "amt/amt-handle/request/version.h"

#include <string.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

namespace {

const std::string FIXED = "\rAndroid4.2,2013-01-21" + std::string(42, '\n');
const std::string ACKNOWLEDGEMENT("\xAA\xBB\xCC\xDD\x08\x00\x00\x00\x02\x02\x00\x00\x76\x4A\xEE\x1D", 16);

std::string request(int32_t type)
{
    return wire_packet(45, int_atom(19, type));
}

std::string reply(int32_t type, const std::string &version)
{
    return wire_packet(46, int_atom(19, type) + bytes_atom(18, version) + int_atom(1, 0));
}

/* The packet in its envelope, whose checksum is the codec's own business. */
std::string envelope(const std::string &packet)
{
    std::string frame("\xAA\xBB\xCC\xDD", 4);
    frame += static_cast<char>(packet.size() + 8);
    frame += std::string("\0\0\0\x02\0\0\0", 7) + packet;
    const uint32_t checksum =
        amt_checksum(reinterpret_cast<const uint8_t *>(frame.data()), static_cast<uint32_t>(frame.size()));
    for (int i = 0; i < 4; i++) {
        frame += static_cast<char>(checksum >> (8 * i) & 0xFF);
    }
    return frame;
}

struct module_row_st
{
    int32_t m_type;
    const char *m_name_ptr;
};

void PrintTo(const module_row_st &row, std::ostream *out)
{
    *out << row.m_name_ptr;
}

class fixed_version : public testing::TestWithParam<module_row_st> {};

TEST_P(fixed_version, is_answered_to_the_app)
{
    const modem_line_c line;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(handle_amt_req_version, request(GetParam().m_type)), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{reply(GetParam().m_type, FIXED)});
    EXPECT_EQ(capture.count_containing(std::string(" - ") + GetParam().m_name_ptr), 1);
    EXPECT_TRUE(line.commands().empty());
}

INSTANTIATE_TEST_SUITE_P(
    modules, fixed_version,
    testing::Values(module_row_st{1, "AMT_PRODUCT_MODULE"}, module_row_st{16, "AMT_SOFTWARE_MODULE"},
                    module_row_st{19, "AMT_PLATFORM_MODULE"}, module_row_st{20, "AMT_APP_MODULE"},
                    module_row_st{32, "AMT_HARDWARE_MODULE"}, module_row_st{64, "AMT_WHOLE_MODULE"}));

TEST(version, the_pc_gets_the_fixed_text_after_an_acknowledgement)
{
    const modem_line_c line;
    for (const int32_t type : {1, 19, 20, 32, 64}) {
        EXPECT_EQ(line.handle(handle_amt_pc_req_version, request(type), AMT_CHANNEL_PC), PUB_ERR_NONE);
        const std::vector<std::string> expected = {ACKNOWLEDGEMENT, envelope(reply(type, FIXED))};
        EXPECT_EQ(line.pc_frames(), expected);
    }
    EXPECT_TRUE(line.app_packets().empty());
}

TEST(version, names_the_modules)
{
    EXPECT_STREQ(amt_version_module_name(17), "AMT_L1_MODULE");
    EXPECT_STREQ(amt_version_module_name(18), "AMT_HLS_MODULE");
    EXPECT_STREQ(amt_version_module_name(64), "AMT_WHOLE_MODULE");
    for (const int32_t type : {0, 2, 15, 33, 65, 256 + 1, -1}) {
        EXPECT_STREQ(amt_version_module_name(type), "(undefined)");
    }
}

TEST(version, an_unknown_module_is_refused)
{
    const modem_line_c line;
    for (const int32_t type : {0, 2, 15, 33, 65}) {
        const log_capture_c capture;
        char expected_a[40];
        snprintf(expected_a, sizeof(expected_a), "unknown version type: 0x%02x", type);
        EXPECT_EQ(line.handle(handle_amt_req_version, request(type)), PUB_ERR_FAIL);
        EXPECT_EQ(capture.texts().back(), expected_a);
        EXPECT_EQ(line.handle(handle_amt_pc_req_version, request(type), AMT_CHANNEL_PC), PUB_ERR_FAIL);
        EXPECT_EQ(capture.texts().back(), expected_a);
    }
    /* No module named at all is module 0. */
    EXPECT_EQ(line.handle(handle_amt_req_version, wire_packet(45, "")), PUB_ERR_FAIL);
    EXPECT_TRUE(line.app_packets().empty());
    EXPECT_TRUE(line.pc_frames().empty());
}

TEST(version, the_pc_gets_the_modems_versions_elsewhere)
{
    const modem_line_c line;
    for (const int32_t type : {17, 18}) {
        EXPECT_EQ(line.handle(handle_amt_pc_req_version, request(type), AMT_CHANNEL_PC), PUB_ERR_NOT_FOUND);
    }
    EXPECT_TRUE(line.pc_frames().empty());
    EXPECT_TRUE(line.commands().empty());
}

TEST(version, the_pc_needs_no_modem_and_the_app_always_does)
{
    const modem_line_c line;
    g_handle_state.m_is_no_modem = 1;
    EXPECT_EQ(line.handle(handle_amt_pc_req_version, request(1), AMT_CHANNEL_PC), PUB_ERR_NONE);
    EXPECT_EQ(line.handle(handle_amt_req_version, request(1)), PUB_ERR_NO_MODEM);
    EXPECT_EQ(line.handle(handle_amt_req_version, request(2)), PUB_ERR_NO_MODEM);
}

TEST(version, the_pc_handler_checks_its_arguments)
{
    const modem_line_c line;
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    EXPECT_EQ(handle_amt_pc_req_version(AMT_CHANNEL_PC, &req, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(handle_amt_pc_req_version(AMT_CHANNEL_PC, nullptr, &rsp), PUB_ERR_PARAM);
    req.m_buf_len = 6;
    EXPECT_EQ(handle_amt_pc_req_version(AMT_CHANNEL_NONE, &req, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(handle_amt_pc_req_version(AMT_CHANNEL_PC, &req, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(set_ap_sw_version_rsp(nullptr), PUB_ERR_PARAM);
    EXPECT_TRUE(line.pc_frames().empty());
}

TEST(version, the_modem_query_checks_its_arguments)
{
    const modem_line_c line;
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    const log_capture_c capture;
    EXPECT_EQ(handle_amt_req_l1_hls_version(AMT_CHANNEL_APP, 17, &req, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, module_en:17, 0, 1, 0");
    req.m_buf_len = 6;
    EXPECT_EQ(handle_amt_req_l1_hls_version(AMT_CHANNEL_APP, 16, &req, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, module_en:16, 0, 0, 0");
    EXPECT_EQ(handle_amt_req_l1_hls_version(AMT_CHANNEL_NONE, 18, &req, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "1, module_en:18, 0, 0, 1");
    EXPECT_TRUE(line.commands().empty());
}

struct value_row_st
{
    const char *m_value_ptr;
    std::string m_version;
};

void PrintTo(const value_row_st &row, std::ostream *out)
{
    *out << row.m_value_ptr;
}

class modem_version : public testing::TestWithParam<value_row_st> {};

TEST_P(modem_version, is_decoded)
{
    const modem_line_c line;
    line.answer(std::string("\r\n^DCMR:") + GetParam().m_value_ptr + "\r\n\r\nOK\r\n");
    EXPECT_EQ(line.handle(handle_amt_req_version, request(18)), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{reply(18, GetParam().m_version)});
    EXPECT_EQ(line.commands(), std::vector<std::string>{"AT^DCMR=18\r"});
}

INSTANTIATE_TEST_SUITE_P(
    values, modem_version,
    testing::Values(value_row_st{"1,0D414243", "ABC"}, value_row_st{"1,0d414243", "ABC"},
                    value_row_st{"  1,  0D414243", "ABC"}, value_row_st{"1,4142430A", "ABC"},
                    value_row_st{"1,4142430a5555", "ABC"}, value_row_st{"1,414", "A"},
                    value_row_st{"1,41 4x2-43", "ABC"}, value_row_st{"1,", ""}, value_row_st{"1,0D", ""},
                    value_row_st{"1,0D0A", ""}, value_row_st{",4142", "AB"}, value_row_st{"1,4142,43", "ABC"},
                    /* The end is found between two pairs too, and the lower case first. */
                    value_row_st{"1,4140A142", "A"},
                    value_row_st{"1,410A420a43", "A\x0A"
                                                 "B"},
                    /* An end before the text leaves nothing of it. */
                    value_row_st{"0A,414243", ""}, value_row_st{"x0a,0D414243", ""},
                    /* Only one 0D is stepped over. */
                    value_row_st{"1,0D0D41", "\x0D"
                                             "A"}));

TEST(modem_version_query, logs_its_command_and_its_result)
{
    const modem_line_c line;
    line.answer("\r\n^DCMR: 1,0D414243\r\n\r\nOK\r\n");
    const log_capture_c capture;
    EXPECT_EQ(line.handle(handle_amt_req_version, request(17)), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("version type: 0x11 - AMT_L1_MODULE"));
    EXPECT_TRUE(capture.has("will send at command:AT^DCMR=17\r"));
    EXPECT_TRUE(capture.has("get version success.type:17, version:[len:3 content:ABC]"));
}

TEST(modem_version_query, looks_for_the_ok_before_an_error)
{
    const modem_line_c line;
    line.answer("\r\n+CME ERROR: 4\r\n\r\n^DCMR: 1,0D414243\r\n\r\nOK\r\n");
    const log_capture_c capture;
    EXPECT_EQ(line.handle(handle_amt_req_version, request(17)), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("get version success.type:17, version:[len:3 content:ABC]"));
}

void expect_no_version(const std::string &answer, const std::string &expected_log)
{
    const modem_line_c line;
    line.answer(answer);
    const log_capture_c capture;
    EXPECT_EQ(line.handle(handle_amt_req_version, request(17)), PUB_ERR_FAIL);
    EXPECT_GE(capture.count_containing(expected_log), 1);
    EXPECT_EQ(capture.texts().back(), "get version failure for type: 0x11");
    EXPECT_TRUE(line.app_packets().empty());
}

TEST(modem_version_query, refuses_a_value_without_a_comma)
{
    expect_no_version("\r\n^DCMR: 1\r\n\r\nOK\r\n", "DCMR-query's result[1] is invalid");
}

TEST(modem_version_query, refuses_an_empty_value)
{
    expect_no_version("\r\n^DCMR: \r\n\r\nOK\r\n", "FUNC-get_l1_hls_version(), error_code=-101");
}

TEST(modem_version_query, takes_408_characters_and_refuses_409)
{
    std::string digits(406, '4');
    const modem_line_c line;
    line.answer("\r\n^DCMR: 1," + digits + "\r\n\r\nOK\r\n");
    EXPECT_EQ(line.handle(handle_amt_req_version, request(17)), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{reply(17, std::string(203, 'D'))});
    expect_no_version("\r\n^DCMR: 1," + digits + "4\r\n\r\nOK\r\n",
                      "FUNC-get_l1_hls_version(), error_code=-100");
}

} // namespace
