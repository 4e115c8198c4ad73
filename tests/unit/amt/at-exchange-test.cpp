#include "amt/amt-handle/channel/at-exchange.h"

#include <algorithm>

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

namespace {

/* Leaves the text in the receive area, as an exchange that has just ended well. */
void receive(const modem_line_c &line, const std::string &text)
{
    static constexpr amt_at_exchange_st exchange = {"test", amt_at_trace_en::NONE, AMT_AT_OK_ANYWHERE, false,
                                                    nullptr};
    line.answer(text);
    amt_at_set_command("AT\r");
    ASSERT_EQ(amt_at_exchange(exchange, nullptr), PUB_ERR_NONE);
    ASSERT_EQ(amt_at_received(), text);
}

struct value_st
{
    int m_status;
    std::string m_text;
};

value_st get_value(const std::string &prefix, uint32_t limit)
{
    std::string text(limit + 1, '\x7F');
    uint32_t length = 99999;
    const int status = amt_at_get_value(prefix.c_str(), limit, text.data(), &length);
    EXPECT_EQ(text.substr(length), std::string(limit + 1 - length, '\0'));
    return {status, text.substr(0, length)};
}

struct value_row_st
{
    const char *m_received_ptr;
    int m_status;
    const char *m_value_ptr;
};

/* Line ends are shown as dots. */
void PrintTo(const value_row_st &row, std::ostream *out)
{
    std::string text = row.m_received_ptr;
    std::replace_if(
        text.begin(), text.end(), [](char c) { return c < ' '; }, '.');
    *out << text;
}

class at_value : public testing::TestWithParam<value_row_st> {};

TEST_P(at_value, is_cut_out_of_the_answer)
{
    const modem_line_c line;
    receive(line, GetParam().m_received_ptr);
    const value_st value = get_value("\r\n^DMSN:", 8);
    EXPECT_EQ(value.m_status, GetParam().m_status);
    EXPECT_EQ(value.m_text, GetParam().m_value_ptr);
}

INSTANTIATE_TEST_SUITE_P(answers, at_value,
                         testing::Values(value_row_st{"\r\n^DMSN: 123\r\n\r\nOK\r\n", 0, "123"},
                                         value_row_st{"\r\n^DMSN:123\r\nOK\r\n", 0, "123"},
                                         value_row_st{"\r\n^DMSN:   1 3 \r\n\r\n\r\n\r\nOK\r\n", 0, "1 3 "},
                                         value_row_st{"\r\n^DMSN: 123\n\r\nOK\r\n", 0, "123\n"},
                                         value_row_st{"\r\n^DMSN: 12345678\r\n\r\nOK\r\n", 0, "12345678"},
                                         value_row_st{"\r\n^DMSN: 123456789\r\n\r\nOK\r\n", PUB_ERR_FAIL,
                                                      "12345678"},
                                         value_row_st{"\r\n^DMSN:\r\nOK\r\n", 0, ""},
                                         value_row_st{"\r\n^DMSN:  \r\n\r\nOK\r\n", 0, ""},
                                         value_row_st{"^DMSN: 123\r\n\r\nOK\r\n", PUB_ERR_FAIL, ""},
                                         value_row_st{"\r\n^DMFD: 123\r\n\r\nOK\r\n", PUB_ERR_FAIL, ""},
                                         /* The final result of an earlier command may still be there. */
                                         value_row_st{"\r\nOK\r\n\r\n^DMSN: 123\r\n\r\nOK\r\n", 0, "123"},
                                         value_row_st{"\r\nOK\r\n\r\n^DMSN: 123\r\n", PUB_ERR_FAIL, ""},
                                         value_row_st{"\r\n^DMSN: 1\r\n\r\n^DMSN: 2\r\n\r\nOK\r\n",
                                                      PUB_ERR_FAIL, "1\r\n\r\n^DM"}));

TEST(at_exchange, cuts_a_command_at_4095_characters)
{
    amt_at_set_command("AT%s", std::string(5000, 'A').c_str());
    EXPECT_EQ(g_at_transmit.m_len, 4095U);
    EXPECT_EQ(std::string(g_at_transmit.m_text_a), "AT" + std::string(4093, 'A'));
    amt_at_set_command("AT\r");
    EXPECT_EQ(g_at_transmit.m_len, 3U);
    EXPECT_EQ(std::string(g_at_transmit.m_text_a, 4096), "AT\r" + std::string(4093, '\0'));
}

TEST(at_exchange, starts_with_an_empty_receive_area)
{
    const modem_line_c line;
    receive(line, "\r\n^DMSN: old\r\n\r\nOK\r\n");
    receive(line, "\r\nOK\r\n");
    EXPECT_EQ(std::string(g_at_receive.m_text_a, 4097), "\r\nOK\r\n" + std::string(4091, '\0'));
}

TEST(at_exchange, finds_terminated_text)
{
    const modem_line_c line;
    receive(line, "ab\r\nOK\r\n");
    EXPECT_STREQ(amt_at_find("b\r\n"), "b\r\nOK\r\n");
    EXPECT_EQ(amt_at_find("c"), nullptr);
}

TEST(at_exchange, removes_text_and_zeroes_the_gap)
{
    const modem_line_c line;
    receive(line, "0123456789OK");
    amt_at_remove(2, 5);
    EXPECT_EQ(std::string(g_at_receive.m_text_a, 13), std::string("01789OK\0\0\0\0\0\0", 13));
    EXPECT_EQ(amt_at_received(), "01789OK");
    amt_at_remove(0, 7);
    EXPECT_TRUE(amt_at_received().empty());
}

int note_and_fail(void *context)
{
    (*static_cast<int *>(context))++;
    return PUB_ERR_FILE;
}

TEST(at_exchange, ends_with_the_status_of_its_step)
{
    static constexpr amt_at_exchange_st exchange = {"test", amt_at_trace_en::NONE, AMT_AT_OK, false,
                                                    note_and_fail};
    const modem_line_c line;
    for (const char *const text : {"partial", "\r\nOK\r\n"}) {
        int count = 0;
        line.answer(text);
        amt_at_set_command("AT\r");
        EXPECT_EQ(amt_at_exchange(exchange, &count), PUB_ERR_FILE);
        EXPECT_EQ(count, 1);
    }
    int count = 0;
    line.answer("\r\nERROR\r\n");
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(exchange, &count), PUB_ERR_FAIL);
    EXPECT_EQ(count, 1);
}

TEST(at_exchange, looks_for_errors_before_its_step_when_told_so)
{
    static constexpr amt_at_exchange_st exchange = {"test", amt_at_trace_en::NONE, AMT_AT_OK, true,
                                                    note_and_fail};
    const modem_line_c line;
    int count = 0;
    line.answer("\r\n+CME ERROR: 3\r\n\r\nOK\r\n");
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(exchange, &count), PUB_ERR_FAIL);
    EXPECT_EQ(count, 0);
}

TEST(at_exchange, a_good_result_outweighs_an_error_otherwise)
{
    static constexpr amt_at_exchange_st exchange = {"test", amt_at_trace_en::NONE, AMT_AT_OK, false, nullptr};
    const modem_line_c line;
    line.answer("\r\n+CME ERROR: 3\r\n\r\nOK\r\n");
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(exchange, nullptr), PUB_ERR_NONE);
}

TEST(at_exchange, traces_each_read)
{
    static constexpr amt_at_exchange_st text_exchange = {"name", amt_at_trace_en::TEXT, AMT_AT_OK, false,
                                                         nullptr};
    static constexpr amt_at_exchange_st status_exchange = {"name", amt_at_trace_en::STATUS, AMT_AT_OK, false,
                                                           nullptr};
    static constexpr amt_at_exchange_st untraced_exchange = {"name", amt_at_trace_en::NONE, AMT_AT_OK, false,
                                                             nullptr};
    modem_line_c line;
    for (const std::string chunk : {"\r\nOK\r\n", "\r\nO", "K\r\n", "\r\nOK\r\n"}) {
        line.answer(chunk);
    }
    const log_capture_c capture;
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(untraced_exchange, nullptr), PUB_ERR_NONE);
    EXPECT_EQ(capture.count_containing("name "), 0);
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(text_exchange, nullptr), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("name :\r\nO"));
    EXPECT_TRUE(capture.has("name :\r\nOK\r\n"));
    EXPECT_EQ(capture.count_containing("name "), 2);
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(status_exchange, nullptr), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("name  ret_val[0] m_buf_a[\r\nOK\r\n]"));
    line.break_reads();
    amt_at_set_command("AT\r");
    EXPECT_EQ(amt_at_exchange(status_exchange, nullptr), PUB_ERR_FAIL);
    EXPECT_TRUE(capture.has("name  ret_val[-100] m_buf_a[]"));
    EXPECT_EQ(capture.count_containing("FUNC-name(), error_code=-100"), 1);
}

} // namespace
