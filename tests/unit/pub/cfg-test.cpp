#include "pub/cfg/cfg.h"

#include <errno.h>
#include <string.h>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/log-capture.h"

namespace {

struct line_st
{
    std::string m_text;
    uint32_t m_length;
    int m_is_eof;
};

bool operator==(const line_st &left, const line_st &right)
{
    return left.m_text == right.m_text && left.m_length == right.m_length && left.m_is_eof == right.m_is_eof;
}

void PrintTo(const line_st &line, std::ostream *stream)
{
    *stream << '"' << line.m_text << "\" length " << line.m_length << " eof " << line.m_is_eof;
}

/* All lines of the content, read with the given capacity; text is all that was stored in the buffer. */
std::vector<line_st> read_lines(const std::string &content, uint32_t capacity = 100)
{
    std::vector<line_st> line_list;
    FILE *stream = tmpfile();
    fwrite(content.data(), 1, content.size(), stream);
    rewind(stream);
    for (int is_eof = 0; is_eof == 0;) {
        std::string buf(capacity + 1, '?');
        buf[capacity] = '\0';
        uint32_t length = 0xFFFF;
        is_eof = 0xFFFF;
        EXPECT_EQ(pub_cfg_get_line(stream, buf.data(), capacity, &length, &is_eof), PUB_ERR_NONE);
        EXPECT_EQ(buf[capacity], '\0') << "wrote behind the capacity";
        line_list.push_back({buf.substr(0, buf.find('\0')), length, is_eof});
    }
    fclose(stream);
    return line_list;
}

/* Splits a copy of the text: "KEY|VALUE", or the status. */
std::string split(const std::string &text)
{
    std::string area = " " + text; /* the blank is no part of it */
    char *const line = area.data() + 1;
    char *key = nullptr;
    char *value = nullptr;
    const int status = pub_cfg_get_param_and_value(line, &key, &value);
    EXPECT_EQ(area[0], ' ');
    if (status != PUB_ERR_NONE) {
        EXPECT_EQ(key, nullptr);
        EXPECT_EQ(value, nullptr);
        return std::to_string(status);
    }
    EXPECT_TRUE(key >= line && key <= line + text.size());
    EXPECT_TRUE(value >= line && value <= line + text.size());
    return std::string(key) + "|" + value;
}

} // namespace

TEST(cfg_get_line, lines_end_at_line_feeds)
{
    EXPECT_THAT(read_lines("one\n\nthree\n"),
                testing::ElementsAre(line_st{"one", 3, 0}, line_st{"", 0, 0}, line_st{"three", 5, 0},
                                     line_st{"", 0, 1}));
}

TEST(cfg_get_line, last_line_needs_no_line_feed)
{
    EXPECT_THAT(read_lines("one\ntwo"), testing::ElementsAre(line_st{"one", 3, 0}, line_st{"two", 3, 1}));
}

TEST(cfg_get_line, empty_input)
{
    EXPECT_THAT(read_lines(""), testing::ElementsAre(line_st{"", 0, 1}));
}

TEST(cfg_get_line, carriage_returns_go_at_the_end_only)
{
    EXPECT_THAT(read_lines("a\r\nb\r\r\r\n\r\n\rc\rd\n"),
                testing::ElementsAre(line_st{"a", 1, 0}, line_st{"b", 1, 0}, line_st{"", 0, 0},
                                     line_st{"\rc\rd", 4, 0}, line_st{"", 0, 1}));
}

TEST(cfg_get_line, line_that_fills_the_buffer_has_no_terminator)
{
    EXPECT_THAT(read_lines("12345\nx\n", 5),
                testing::ElementsAre(line_st{"12345", 5, 0}, line_st{"x", 1, 0}, line_st{"", 0, 1}));
}

TEST(cfg_get_line, what_does_not_fit_is_dropped)
{
    EXPECT_THAT(read_lines(std::string(101, 'a') + "\nnext", 100),
                testing::ElementsAre(line_st{std::string(100, 'a'), 100, 0}, line_st{"next", 4, 1}));
    EXPECT_THAT(read_lines("1234567\r\nx", 5),
                testing::ElementsAre(line_st{"12345", 5, 0}, line_st{"x", 1, 1}));
}

TEST(cfg_get_line, length_ends_at_a_zero_byte)
{
    const std::string content("ab\r\0cd\r\nx", 9);
    EXPECT_THAT(read_lines(content), testing::ElementsAre(line_st{"ab", 2, 0}, line_st{"x", 1, 1}));
}

TEST(cfg_get_line, rest_of_the_buffer_is_zeroed)
{
    char input_a[] = "ab\n";
    FILE *stream = fmemopen(input_a, 3, "r");
    char buf_a[8];
    memset(buf_a, '?', sizeof(buf_a));
    uint32_t length = 0;
    int is_eof = 0;
    EXPECT_EQ(pub_cfg_get_line(stream, buf_a, sizeof(buf_a), &length, &is_eof), PUB_ERR_NONE);
    EXPECT_EQ(std::string(buf_a, sizeof(buf_a)), std::string("ab\0\0\0\0\0\0", 8));
    fclose(stream);
}

TEST(cfg_get_line, no_capacity_reads_and_drops_the_line)
{
    EXPECT_THAT(read_lines("abc\nd", 0), testing::ElementsAre(line_st{"", 0, 0}, line_st{"", 0, 1}));
}

TEST(cfg_get_line, absent_arguments)
{
    char input_a[] = "ab\n";
    FILE *stream = fmemopen(input_a, 3, "r");
    char buf_a[4] = "old";
    uint32_t length = 7;
    int is_eof = 7;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_cfg_get_line(nullptr, buf_a, 4, &length, &is_eof), PUB_ERR_PARAM);
    EXPECT_EQ(pub_cfg_get_line(stream, nullptr, 4, &length, &is_eof), PUB_ERR_PARAM);
    EXPECT_EQ(pub_cfg_get_line(stream, buf_a, 4, nullptr, &is_eof), PUB_ERR_PARAM);
    EXPECT_EQ(pub_cfg_get_line(stream, buf_a, 4, &length, nullptr), PUB_ERR_PARAM);
    fclose(stream);
    EXPECT_STREQ(buf_a, "old");
    EXPECT_EQ(length, 7U);
    EXPECT_EQ(is_eof, 7);
    const std::string error = error_line("cfg/cfg", "pub_cfg_get_line", -101, 0);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(error, "1, 0, 0, 0", error, "0, 1, 0, 0", error, "0, 0, 1, 0", error,
                                     "0, 0, 0, 1"));
}

TEST(cfg_get_line, reads_without_logging)
{
    const log_capture_c capture;
    read_lines("a=b\nc\n");
    EXPECT_TRUE(capture.records().empty());
}

TEST(cfg_split, blanks_around_key_and_value_go)
{
    EXPECT_EQ(split("vx.tty.pc=/dev/ttyX"), "vx.tty.pc|/dev/ttyX");
    EXPECT_EQ(split("   vx.tty.pc   =   /dev/ttyX   "), "vx.tty.pc|/dev/ttyX");
    EXPECT_EQ(split("a b = c d "), "a b|c d");
}

TEST(cfg_split, first_equals_sign_splits)
{
    EXPECT_EQ(split("a=b=c"), "a|b=c");
    EXPECT_EQ(split("a == c"), "a|= c");
}

TEST(cfg_split, empty_key_and_value)
{
    EXPECT_EQ(split("="), "|");
    EXPECT_EQ(split("   =   "), "|");
    EXPECT_EQ(split("a="), "a|");
    EXPECT_EQ(split("a=   "), "a|");
    EXPECT_EQ(split("  = b"), "|b");
}

TEST(cfg_split, tabs_are_no_blanks)
{
    EXPECT_EQ(split("\ta\t=\tb\t"), "\ta\t|\tb\t");
}

TEST(cfg_split, comments_and_other_lines)
{
    EXPECT_EQ(split("#vx.tty.pc=/dev/a"), "-104");
    EXPECT_EQ(split("  # x = y"), "-104");
    EXPECT_EQ(split("\t# x = y"), "\t# x|y");
    EXPECT_EQ(split("a=#b"), "a|#b");
    EXPECT_EQ(split("no sign"), "-104");
    EXPECT_EQ(split(""), "-104");
    EXPECT_EQ(split("    "), "-104");
}

TEST(cfg_split, absent_arguments)
{
    char line_a[] = "a=b";
    char *text = nullptr;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_cfg_get_param_and_value(nullptr, &text, &text), PUB_ERR_PARAM);
    EXPECT_EQ(pub_cfg_get_param_and_value(line_a, nullptr, &text), PUB_ERR_PARAM);
    EXPECT_EQ(pub_cfg_get_param_and_value(line_a, &text, nullptr), PUB_ERR_PARAM);
    EXPECT_STREQ(line_a, "a=b");
    const std::string error = error_line("cfg/cfg", "pub_cfg_get_param_and_value", -101, 0);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(error, "1, 0, 0", error, "0, 1, 0", error, "0, 0, 1"));
}

TEST(cfg_split, splits_without_logging)
{
    const log_capture_c capture;
    split("a=b");
    split("# a=b");
    split("a");
    EXPECT_TRUE(capture.records().empty());
}
