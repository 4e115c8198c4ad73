#include "amt/amt-handle/at/at-operand.h"

#include <string.h>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/support/log-lines.h"

namespace {

constexpr char PREFIX[] = "AT^DMSN=";
constexpr char FILLER = '\x7F';

void hold(const std::string &text)
{
    amt_handle_clear_buf(&g_handle_context.m_req);
    g_handle_context.m_req.m_buf_len =
        static_cast<uint32_t>(text.copy(reinterpret_cast<char *>(g_handle_context.m_req.m_buf_a), 4095));
}

class at_operand : public testing::Test {
protected:
    void TearDown() override
    {
        amt_handle_clear_buf(&g_handle_context.m_req);
    }
};

/* The parameter and nothing behind it: no terminator is added. */
std::string get_para(const std::string &held)
{
    hold(held);
    std::string out(40, FILLER);
    uint32_t length = 99;
    EXPECT_EQ(handle_amt_get_at_para(PREFIX, out.data(), &length), PUB_ERR_NONE);
    EXPECT_LE(length, AMT_AT_PARA_SIZE);
    EXPECT_EQ(out.substr(length), std::string(40 - length, FILLER));
    return out.substr(0, length);
}

TEST_F(at_operand, parameter_ends_at_the_line_end)
{
    EXPECT_EQ(get_para("AT^DMSN=12\r"), "12");
    EXPECT_EQ(get_para("AT^DMSN=12\r\n"), "12");
    EXPECT_EQ(get_para("AT^DMSN=12\n\r"), "12");
    EXPECT_EQ(get_para("AT^DMSN=1 2 \rAT^DMSN=3\r"), "1 2 ");
    EXPECT_EQ(get_para("AT^DMSN=\r"), "");
}

TEST_F(at_operand, parameter_ends_with_the_held_data)
{
    EXPECT_EQ(get_para("AT^DMSN=12"), "12");
    EXPECT_EQ(get_para("AT^DMSN="), "");
    EXPECT_EQ(get_para(std::string("AT^DMSN=12\0", 11) + "34"), "12");
    EXPECT_EQ(get_para(std::string(4087, 'x') + "AT^DMSN="), "");
    EXPECT_EQ(get_para(std::string(4082, 'x') + "AT^DMSN=12345"), "12345");
}

TEST_F(at_operand, leading_blanks_do_not_count)
{
    EXPECT_EQ(get_para("AT^DMSN=   12\r"), "12");
    EXPECT_EQ(get_para("AT^DMSN=   \r"), "");
    EXPECT_EQ(get_para("AT^DMSN=                      \t12"), "\t12");
}

TEST_F(at_operand, parameter_has_at_most_20_characters)
{
    const std::string text = "123456789012345678901234567890";
    for (const size_t size : {19U, 20U, 21U, 30U}) {
        EXPECT_EQ(get_para("AT^DMSN=" + text.substr(0, size) + "\r"), text.substr(0, size).substr(0, 20));
    }
}

TEST_F(at_operand, line_end_before_the_command_leaves_no_parameter)
{
    EXPECT_EQ(get_para("\rAT^DMSN=12\r"), "");
    EXPECT_EQ(get_para("AT\r\nAT^DMSN=12\r"), "");
    /* A line feed alone is no line end there. */
    EXPECT_EQ(get_para("AT\nAT^DMSN=12\r"), "12");
}

TEST_F(at_operand, absent_prefix_is_refused)
{
    hold("AT^DMSN?\r");
    char out_a[AMT_AT_PARA_SIZE] = {FILLER};
    uint32_t length = 99;
    const log_capture_c capture;
    EXPECT_EQ(handle_amt_get_at_para(PREFIX, out_a, &length), PUB_ERR_FAIL);
    EXPECT_EQ(length, 0U);
    EXPECT_EQ(out_a[0], FILLER);
    EXPECT_EQ(
        without_line_numbers(capture),
        (std::vector<std::string>{error_line("amt/amt-handle", "handle_amt_get_at_para", PUB_ERR_FAIL, errno),
                                  "at cmd[AT^DMSN?\r] do not include (AT^DMSN=)."}));
}

TEST_F(at_operand, absent_arguments_are_refused)
{
    char out_a[AMT_AT_PARA_SIZE];
    uint32_t length = 0;
    const log_capture_c capture;
    EXPECT_EQ(handle_amt_get_at_para(nullptr, out_a, &length), PUB_ERR_PARAM);
    EXPECT_EQ(handle_amt_get_at_para(PREFIX, nullptr, &length), PUB_ERR_PARAM);
    EXPECT_EQ(handle_amt_get_at_para(PREFIX, out_a, nullptr), PUB_ERR_PARAM);
    for (const char *const flags : {"1, 0, 0", "0, 1, 0", "0, 0, 1"}) {
        EXPECT_TRUE(capture.has(flags)) << flags;
    }
}

std::vector<std::string> split(const std::string &text)
{
    amt_at_operands_st list;
    memset(&list, FILLER, sizeof(list));
    amt_at_operands_init(&list, text.c_str());
    std::vector<std::string> operands;
    for (const char *operand = amt_at_operands_next(&list); operand != nullptr;
         operand = amt_at_operands_next(&list))
    {
        operands.emplace_back(operand);
    }
    EXPECT_EQ(amt_at_operands_next(&list), nullptr);
    return operands;
}

TEST_F(at_operand, operands_are_separated_by_commas)
{
    using list_t = std::vector<std::string>;
    EXPECT_EQ(split("1,6,540,15\r"), (list_t{"1", "6", "540", "15"}));
    EXPECT_EQ(split("1\r2,3\r"), (list_t{"1"}));
    EXPECT_EQ(split("2,SN 1\n"), (list_t{"2", "SN 1"}));
    EXPECT_EQ(split(",,1,,2,"), (list_t{"1", "2"}));
    EXPECT_EQ(split("1, 2"), (list_t{"1", " 2"}));
    EXPECT_EQ(split(""), list_t{});
    EXPECT_EQ(split(",,\r"), list_t{});
    EXPECT_EQ(split("\r1"), list_t{});
}

TEST_F(at_operand, operands_are_as_long_as_a_request_may_be)
{
    const std::string text(4095, 'z');
    EXPECT_EQ(split(text), std::vector<std::string>{text});
}

std::string copy_quoted(const std::string &text, uint32_t capacity)
{
    std::string out(capacity + 8, FILLER);
    amt_at_copy_quoted(text.c_str(), out.data(), capacity);
    EXPECT_EQ(out.substr(capacity), std::string(8, FILLER));
    const size_t length = out.find('\0');
    EXPECT_LT(length, capacity);
    return out.substr(0, length);
}

TEST_F(at_operand, quoted_value_ends_at_quote_line_end_or_held_data)
{
    EXPECT_EQ(copy_quoted("00:11\"\r", 20), "00:11");
    EXPECT_EQ(copy_quoted("00:11\"22\"\r", 20), "00:11");
    EXPECT_EQ(copy_quoted("00:11\r\"", 20), "00:11");
    EXPECT_EQ(copy_quoted("00:11\n", 20), "00:11");
    EXPECT_EQ(copy_quoted("00:11", 20), "00:11");
    EXPECT_EQ(copy_quoted("\"", 20), "");
    EXPECT_EQ(copy_quoted("", 20), "");
    EXPECT_EQ(copy_quoted(" a b \"", 20), " a b ");
}

TEST_F(at_operand, quoted_value_is_cut)
{
    const std::string text(4000, 'q');
    for (const uint32_t capacity : {1U, 2U, 20U}) {
        EXPECT_EQ(copy_quoted(text, capacity), text.substr(0, capacity - 1));
    }
    EXPECT_EQ(copy_quoted("1234567890123456789\"", 20), "1234567890123456789");
    EXPECT_EQ(copy_quoted("12345678901234567890\"", 20), "1234567890123456789");
}

} // namespace
