#include "amt/amt-device/number-scan.h"

#include <limits.h>
#include <string>

#include <gtest/gtest.h>

namespace {

constexpr bool LONG_HAS_64_BITS = sizeof(long) == 8;

/* Gives the text to the scanner as a file, with what the C library itself reads beside it. */
template <typename value_t> struct scan_st
{
    int m_count;
    value_t m_value;
};

template <typename value_t>
scan_st<value_t> scan(const std::string &text, int (*scanner)(FILE *, value_t *), value_t before)
{
    std::string content = text;
    FILE *stream = content.empty() ? fopen("/dev/null", "r") : fmemopen(content.data(), content.size(), "r");
    scan_st<value_t> result = {0, before};
    result.m_count = scanner(stream, &result.m_value);
    fclose(stream);
    return result;
}

scan_st<int32_t> scan_int(const std::string &text)
{
    return scan<int32_t>(text, amt_number_scan_int, 77);
}

scan_st<uint32_t> scan_unsigned(const std::string &text)
{
    return scan<uint32_t>(text, amt_number_scan_unsigned, 77);
}

void expect_int(const std::string &text, int32_t value)
{
    const scan_st<int32_t> result = scan_int(text);
    EXPECT_EQ(result.m_count, 1) << text;
    EXPECT_EQ(result.m_value, value) << text;
}

void expect_no_int(const std::string &text, int count)
{
    const scan_st<int32_t> result = scan_int(text);
    EXPECT_EQ(result.m_count, count) << text;
    EXPECT_EQ(result.m_value, 77) << text;
}

TEST(number_scan, takes_the_number_at_the_start)
{
    expect_int("4012345", 4012345);
    expect_int("4012345\n", 4012345);
    expect_int(" \t\r\n\v\f-17\n", -17);
    expect_int("+17", 17);
    expect_int("0", 0);
    expect_int("-0", 0);
    expect_int("007", 7);
    expect_int("2147483647", INT32_MAX);
    expect_int("-2147483648", INT32_MIN);
}

TEST(number_scan, ignores_what_follows_the_number)
{
    expect_int("12abc", 12);
    expect_int("12 34", 12);
    expect_int("12.9", 12);
    expect_int("0x1F", 0);
    expect_int("5-3", 5);
}

TEST(number_scan, tells_other_text_from_no_text)
{
    expect_no_int("abc", 0);
    expect_no_int("-", 0);
    expect_no_int("+-5", 0);
    expect_no_int("- 5", 0);
    expect_no_int("", EOF);
    expect_no_int(" \n\n ", EOF);
}

TEST(number_scan, cuts_what_a_long_holds_to_32_bits)
{
    if (!LONG_HAS_64_BITS) {
        GTEST_SKIP() << "long has 32 bits here";
    }
    expect_int("2147483648", INT32_MIN);
    expect_int("4294967295", -1);
    expect_int("4294967301", 5);
    expect_int("-4294967301", -5);
}

TEST(number_scan, saturates_what_a_long_does_not_hold)
{
    const int32_t highest = static_cast<int32_t>(static_cast<uint32_t>(LONG_MAX));
    const int32_t lowest = static_cast<int32_t>(static_cast<uint32_t>(LONG_MIN));
    expect_int("99999999999999999999", highest);
    expect_int("-99999999999999999999", lowest);
    expect_int(std::string(5000, '9'), highest);
}

TEST(number_scan, counts_no_leading_zeros)
{
    expect_int(std::string(5000, '0') + "123", 123);
    expect_int("-" + std::string(5000, '0') + "123", -123);
    expect_int(std::string(5000, '0'), 0);
}

/* What the C library of this machine makes of the same text is what is promised. */
TEST(number_scan, agrees_with_the_c_library)
{
    for (const std::string text :
         {"1", "-1", " +42x", "2147483647", "-2147483648", "abc", "-", "00012", "7 8"}) {
        int32_t expected = 77;
        const int count = sscanf(text.c_str(), "%d", &expected);
        EXPECT_EQ(scan_int(text).m_count, count) << text;
        EXPECT_EQ(scan_int(text).m_value, expected) << text;
        uint32_t expected_unsigned = 77;
        const int count_unsigned = sscanf(text.c_str(), "%u", &expected_unsigned);
        EXPECT_EQ(scan_unsigned(text).m_count, count_unsigned) << text;
        EXPECT_EQ(scan_unsigned(text).m_value, expected_unsigned) << text;
    }
}

TEST(number_scan, unsigned_takes_a_sign_and_the_whole_range)
{
    EXPECT_EQ(scan_unsigned("4294967295").m_value, UINT32_MAX);
    EXPECT_EQ(scan_unsigned("-1").m_value, UINT32_MAX);
    EXPECT_EQ(scan_unsigned("99999999999999999999999").m_value, UINT32_MAX);
    EXPECT_EQ(scan_unsigned("x").m_count, 0);
    EXPECT_EQ(scan_unsigned("").m_count, EOF);
}

} // namespace
