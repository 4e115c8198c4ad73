#include "pub/file/scan.h"

#include <errno.h>
#include <limits.h>
#include <string>

#include <gtest/gtest.h>

#include "tests/unit/support/temp-folder.h"

namespace {

constexpr bool LONG_HAS_64_BITS = sizeof(long) == 8;

/* Gives the text to the scanner as a file, with what the C library itself reads beside it. */
template <typename value_t> struct scan_st
{
    int m_count;
    value_t m_value;
};

template <typename value_t>
scan_st<value_t> scan(const std::string &text, int (*scanner)(const pub_file_st &, value_t *), value_t before)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("text"), text);
    const pub_file_st file(folder.path("text").c_str(), pub_file_mode_en::READ);
    scan_st<value_t> result = {0, before};
    result.m_count = scanner(file, &result.m_value);
    return result;
}

scan_st<int32_t> scan_int(const std::string &text)
{
    return scan<int32_t>(text, pub_file_scan_int, 77);
}

scan_st<uint32_t> scan_unsigned(const std::string &text)
{
    return scan<uint32_t>(text, pub_file_scan_unsigned, 77);
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

TEST(file_scan, takes_the_number_at_the_start)
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

TEST(file_scan, ignores_what_follows_the_number)
{
    expect_int("12abc", 12);
    expect_int("12 34", 12);
    expect_int("12.9", 12);
    expect_int("0x1F", 0);
    expect_int("5-3", 5);
}

TEST(file_scan, tells_other_text_from_no_text)
{
    expect_no_int("abc", 0);
    expect_no_int("-", 0);
    expect_no_int("+-5", 0);
    expect_no_int("- 5", 0);
    expect_no_int("", EOF);
    expect_no_int(" \n\n ", EOF);
}

TEST(file_scan, cuts_what_a_long_holds_to_32_bits)
{
    if (!LONG_HAS_64_BITS) {
        GTEST_SKIP() << "long has 32 bits here";
    }
    expect_int("2147483648", INT32_MIN);
    expect_int("4294967295", -1);
    expect_int("4294967301", 5);
    expect_int("-4294967301", -5);
}

TEST(file_scan, saturates_what_a_long_does_not_hold)
{
    const int32_t highest = static_cast<int32_t>(static_cast<uint32_t>(LONG_MAX));
    const int32_t lowest = static_cast<int32_t>(static_cast<uint32_t>(LONG_MIN));
    expect_int("99999999999999999999", highest);
    expect_int("-99999999999999999999", lowest);
    expect_int(std::string(5000, '9'), highest);
}

TEST(file_scan, counts_no_leading_zeros)
{
    expect_int(std::string(5000, '0') + "123", 123);
    expect_int("-" + std::string(5000, '0') + "123", -123);
    expect_int(std::string(5000, '0'), 0);
}

/* What the C library of this machine makes of the same text is what is promised. */
TEST(file_scan, agrees_with_the_c_library)
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

TEST(file_scan, unsigned_takes_a_sign_and_the_whole_range)
{
    EXPECT_EQ(scan_unsigned("4294967295").m_value, UINT32_MAX);
    EXPECT_EQ(scan_unsigned("-1").m_value, UINT32_MAX);
    EXPECT_EQ(scan_unsigned("99999999999999999999999").m_value, UINT32_MAX);
    EXPECT_EQ(scan_unsigned("x").m_count, 0);
    EXPECT_EQ(scan_unsigned("").m_count, EOF);
}

TEST(file_scan, long_takes_what_a_long_holds_and_its_ends)
{
    const auto scan_long = [](const std::string &text) { return scan<long>(text, pub_file_scan_long, 77); };
    EXPECT_EQ(scan_long("0000000000000000000000000042\n").m_value, 42);
    EXPECT_EQ(scan_long("-42").m_value, -42);
    EXPECT_EQ(scan_long(std::to_string(LONG_MAX)).m_value, LONG_MAX);
    EXPECT_EQ(scan_long(std::to_string(LONG_MIN)).m_value, LONG_MIN);
    EXPECT_EQ(scan_long("99999999999999999999999").m_value, LONG_MAX);
    EXPECT_EQ(scan_long("-99999999999999999999999").m_value, LONG_MIN);
    EXPECT_EQ(scan_long("x").m_count, 0);
    EXPECT_EQ(scan_long("").m_count, EOF);
}

TEST(file_scan, a_failure_shows_its_own_errno_or_none)
{
    const temp_folder_c folder;
    const pub_file_st unreadable(folder.path("").c_str(), pub_file_mode_en::READ);
    int32_t value = 77;
    char word_a[8];
    errno = EXDEV;
    EXPECT_EQ(pub_file_scan_int(unreadable, &value), EOF);
    EXPECT_EQ(errno, EISDIR);
    errno = EXDEV;
    EXPECT_EQ(pub_file_scan_word(unreadable, word_a, sizeof(word_a)), EOF);
    EXPECT_EQ(errno, EISDIR);
    write_whole_file(folder.path("text"), "no number");
    const pub_file_st other(folder.path("text").c_str(), pub_file_mode_en::READ);
    errno = EXDEV;
    EXPECT_EQ(pub_file_scan_int(other, &value), 0);
    EXPECT_EQ(errno, 0);
}

std::string scan_word(const std::string &text)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("text"), text);
    const pub_file_st file(folder.path("text").c_str(), pub_file_mode_en::READ);
    char word_a[6] = "old";
    return pub_file_scan_word(file, word_a, sizeof(word_a)) == 1 ? word_a : "(none)";
}

TEST(file_scan, word_ends_at_a_blank_a_zero_byte_or_the_room)
{
    using namespace std::string_literals;
    EXPECT_EQ(scan_word(" \n\tone two"), "one");
    EXPECT_EQ(scan_word("two\0three"s), "two");
    EXPECT_EQ(scan_word("12345"), "12345");
    EXPECT_EQ(scan_word("123456"), "12345");
    EXPECT_EQ(scan_word("\0x"s), "");
    EXPECT_EQ(scan_word(""), "(none)");
    EXPECT_EQ(scan_word(" \r\n"), "(none)");
}

TEST(file_scan, leaves_what_follows_unread)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("text"), "12abcdefgh 7\n");
    const pub_file_st file(folder.path("text").c_str(), pub_file_mode_en::READ);
    int32_t value = 0;
    EXPECT_EQ(pub_file_scan_int(file, &value), 1);
    char word_a[6];
    EXPECT_EQ(pub_file_scan_word(file, word_a, sizeof(word_a)), 1);
    EXPECT_STREQ(word_a, "abcde");
    EXPECT_EQ(pub_file_scan_word(file, word_a, sizeof(word_a)), 1);
    EXPECT_STREQ(word_a, "fgh");
    EXPECT_EQ(pub_file_scan_int(file, &value), 1);
    EXPECT_EQ(value, 7);
}

} // namespace
