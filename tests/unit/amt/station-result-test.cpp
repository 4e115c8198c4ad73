#include "amt/amt-handle/request/station-result.h"

#include <string.h>

#include <gtest/gtest.h>

#include "tests/unit/support/log-capture.h"

namespace {

struct row_st
{
    const char *m_line_ptr;
    int32_t m_station_num;
    int32_t m_verdict;
    const char *m_description_ptr;
};

void PrintTo(const row_st &row, std::ostream *out)
{
    *out << "line " << row.m_line_ptr;
}

class station_result : public testing::TestWithParam<row_st> {};

TEST_P(station_result, is_parsed)
{
    amt_station_result_st result = {77, 5, "before"};
    amt_station_result_parse(GetParam().m_line_ptr, static_cast<uint32_t>(strlen(GetParam().m_line_ptr)),
                             &result);
    EXPECT_EQ(result.m_station_num, GetParam().m_station_num);
    EXPECT_EQ(result.m_verdict, GetParam().m_verdict);
    EXPECT_STREQ(result.m_description_a, GetParam().m_description_ptr);
}

INSTANTIATE_TEST_SUITE_P(lines, station_result,
                         testing::Values(row_st{"3,1,good", 3, 1, "good"},
                                         row_st{"19,2,no, bad", 19, 2, "no, bad"}, row_st{"0,0,", 0, 0, ""},
                                         row_st{"12,1", 12, 1, "before"}, row_st{"12", 12, 5, "before"},
                                         row_st{"12,", 12, 5, "before"}, row_st{"", 77, 5, "before"},
                                         row_st{",2,x", 77, 2, "x"}, row_st{"x,1,y", 77, 5, "before"},
                                         row_st{"-1,1", 77, 5, "before"},
                                         /* The third digit is taken for the verdict. */
                                         row_st{"123,1,y", 12, 3, "1,y"}, row_st{"3,21,y", 3, 2, "before"},
                                         row_st{"3,,y", 3, 5, "y"}, row_st{"3, 1,y", 3, 5, "before"}));

TEST(station_result_limits, cuts_a_description_at_127_characters)
{
    for (const size_t size : {126U, 127U, 128U, 500U}) {
        const std::string line = "3,1," + std::string(size, 'd');
        amt_station_result_st result;
        memset(&result, 0x7F, sizeof(result));
        amt_station_result_parse(line.data(), static_cast<uint32_t>(line.size()), &result);
        EXPECT_EQ(result.m_description_a, std::string(size < 127 ? size : 127, 'd'));
    }
}

TEST(station_result_limits, reads_no_further_than_the_line)
{
    amt_station_result_st result = {77, 5, "before"};
    amt_station_result_parse("12,1,abc", 1, &result);
    EXPECT_EQ(result.m_station_num, 1);
    EXPECT_EQ(result.m_verdict, 5);
    amt_station_result_parse("12,1,abc", 7, &result);
    EXPECT_STREQ(result.m_description_a, "ab");
}

TEST(station_result_limits, logs_every_part)
{
    amt_station_result_st result = {};
    const log_capture_c capture;
    amt_station_result_parse("12,1,abc", 8, &result);
    const std::vector<std::string> expected = {"amt_modem_read_test_result station_num[12]",
                                               "amt_modem_read_test_result station_result[1]",
                                               "amt_modem_read_test_result test_description_a[abc]"};
    EXPECT_EQ(capture.texts(), expected);
}

} // namespace
