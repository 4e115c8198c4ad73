#include "amt/amt-handle/request/modem-tunnel.h"

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

namespace {

const std::string OK = "\r\nOK\r\n";
const std::string REQUEST = wire_packet(0x2F, byte_atom(1, 1));

/* A table read's answer: the length field as given, then the data. */
std::string table_answer(const std::string &length_hex, const std::string &data_hex)
{
    return "\r\n^DTTEST: 3000000000" + length_hex + data_hex + "\r\n";
}

std::string table_packet(const std::string &data)
{
    return wire_packet(0x30, int_atom(1, 0) + bytes_atom(4, data));
}

TEST(modem_tunnel, passes_2041_bytes_and_refuses_2042)
{
    const modem_line_c line;
    line.answer(OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, wire_packet(3, bytes_atom(4, std::string(2040, '\xA5')))),
              PUB_ERR_NONE);
    std::string command = "AT^DTTEST=03";
    for (int i = 0; i < 2040; i++) {
        command += "A5";
    }
    EXPECT_EQ(line.commands(), std::vector<std::string>{command + "\r"});

    const log_capture_c capture;
    EXPECT_EQ(line.handle(amt_modem_handle_req, wire_packet(3, bytes_atom(4, std::string(2041, '\xA5')))),
              PUB_ERR_FAIL);
    EXPECT_TRUE(capture.has("(10 + 2042 * 2 + 2) < 4096"));
    EXPECT_EQ(capture.count_containing("FUNC-amt_modem_handle_req(), error_code=-100"), 1);
    EXPECT_TRUE(line.commands().empty());
    EXPECT_TRUE(line.app_packets().empty());
}

TEST(modem_tunnel, refuses_channel_0_before_the_modem_is_touched)
{
    const modem_line_c line;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST, 0), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "1, 0, 0, 0");
    EXPECT_TRUE(line.commands().empty());
}

TEST(modem_tunnel, refuses_a_malformed_request_before_the_modem_is_touched)
{
    const modem_line_c line;
    std::string request = REQUEST;
    request[6] = '\x11';
    EXPECT_EQ(line.handle(amt_modem_handle_req, request), PUB_ERR_FAIL);
    request = REQUEST;
    request[2] = '\x11';
    EXPECT_EQ(line.handle(amt_modem_handle_req, request), PUB_ERR_FAIL);
    EXPECT_TRUE(line.commands().empty());
    EXPECT_TRUE(line.app_packets().empty());
}

TEST(modem_tunnel, accepts_either_case_and_reads_other_characters_as_nothing)
{
    const modem_line_c line;
    line.answer(table_answer("04000000", "aBCd1g-F") + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet("\xAB\xCD\x10\x0F")});
}

TEST(modem_tunnel, counts_a_byte_for_each_character)
{
    /* The surplus of the block comes from what follows the line: its own end first. */
    const modem_line_c line;
    line.answer(table_answer("06000000", "") + "112233\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(),
              std::vector<std::string>{table_packet(std::string("\0\x11\x22\x33\0\0", 6))});
}

TEST(modem_tunnel, a_short_text_gives_a_packet_with_a_result)
{
    const modem_line_c line;
    line.answer("\r\n^DTTEST: 0102\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{wire_packet(1, int_atom(1, 0x02000000))});
}

TEST(modem_tunnel, refuses_an_empty_text)
{
    const modem_line_c line;
    line.answer("\r\n^DTTEST: \r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_PARAM);
    EXPECT_TRUE(line.app_packets().empty());
}

TEST(modem_tunnel, sends_one_packet_a_read)
{
    const modem_line_c line;
    line.answer(table_answer("01000000", "31"));
    line.answer(table_answer("01000000", "32"));
    line.answer(table_answer("01000000", "33") + table_answer("01000000", "34") + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    const std::vector<std::string> expected = {table_packet("1"), table_packet("2"), table_packet("3")};
    EXPECT_EQ(line.app_packets(), expected);
}

TEST(modem_tunnel, what_precedes_an_error_stands)
{
    const modem_line_c line;
    line.answer(table_answer("01000000", "31"));
    line.answer("\r\n+CME ERROR: 4\r\n");
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_FAIL);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet("1")});
}

TEST(modem_tunnel, takes_an_answer_line_out_of_the_middle)
{
    const modem_line_c line;
    line.answer("\r\n+CREG: 1" + table_answer("01000000", "31") + "\r\nERROR");
    line.answer("\r\n");
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_FAIL);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet("1")});
}

TEST(modem_tunnel, a_failed_conversion_ends_the_wait)
{
    const modem_line_c line;
    line.answer(table_answer("00000000", ""));
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_PARAM);
    EXPECT_TRUE(line.app_packets().empty());
}

struct length_row_st
{
    const char *m_answer_ptr;
    int m_status;
};

void PrintTo(const length_row_st &row, std::ostream *out)
{
    *out << row.m_answer_ptr;
}

class tunnel_length : public testing::TestWithParam<length_row_st> {};

TEST_P(tunnel_length, that_cannot_be_is_refused)
{
    const modem_line_c line;
    line.answer(std::string("\r\n^DTTEST: ") + GetParam().m_answer_ptr + "\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), GetParam().m_status);
    EXPECT_TRUE(line.app_packets().empty());
}

INSTANTIATE_TEST_SUITE_P(hostile, tunnel_length,
                         testing::Values(length_row_st{"300000000000000000", PUB_ERR_PARAM},
                                         length_row_st{"3000000000FFFF0000", PUB_ERR_FAIL},
                                         length_row_st{"3000000000FFFFFFFF", PUB_ERR_FAIL},
                                         length_row_st{"3000000000FFFFFF7F", PUB_ERR_FAIL},
                                         length_row_st{"3000000000ED0F0000", PUB_ERR_FAIL}, /* 4077 */
                                         length_row_st{"98000000000000", PUB_ERR_PARAM},
                                         length_row_st{"9800000000FFFF", PUB_ERR_FAIL},
                                         length_row_st{"180000000000000001FFFFFFFF", PUB_ERR_FAIL}));

TEST(modem_tunnel, fills_a_length_that_only_just_fits_with_zeros)
{
    const modem_line_c line;
    line.answer(table_answer("EC0F0000", "41") + OK); /* 4076 */
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet("A" + std::string(4075, '\0'))});
}

TEST(modem_tunnel, decodes_a_text_as_long_as_the_area)
{
    const modem_line_c line;
    const std::string answer = table_answer("ED070000", std::string(4059, '7')) + OK; /* 2029 */
    ASSERT_EQ(answer.size(), 4096U);
    line.answer(answer);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet(std::string(2029, 'w'))});
}

TEST(modem_tunnel, fills_with_zeros_what_would_lie_behind_the_area)
{
    const modem_line_c line;
    /* What is sent may lie there: digits would be seen. */
    line.answer(table_answer("EC0F0000", std::string(4059, '7')) + OK); /* 4076 */
    EXPECT_EQ(line.handle(amt_modem_handle_req, wire_packet(0x2F, bytes_atom(4, std::string(2000, '\x5A')))),
              PUB_ERR_NONE);
    const std::string data = std::string(2029, 'w') + '\x70' + std::string(2046, '\0');
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet(data)});
}

TEST(modem_tunnel, shows_nothing_of_an_earlier_answer_behind_a_shorter_one)
{
    const modem_line_c line;
    line.answer(table_answer("ED070000", std::string(4059, '7')) + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets().size(), 1U);
    line.answer(table_answer("EC0F0000", "41") + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet("A" + std::string(4075, '\0'))});
}

TEST(modem_tunnel, looks_for_the_answer_and_the_ok_before_an_error)
{
    const modem_line_c line;
    line.answer("\r\n+CME ERROR: 4\r\n" + table_answer("01000000", "31") + OK);
    EXPECT_EQ(line.handle(amt_modem_handle_req, REQUEST), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{table_packet("1")});
}

} // namespace
