#include "amt/amt-handle/request/nvram-file.h"

#include <errno.h>
#include <stdio.h>
#include <string>

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/log-lines.h"
#include "tests/unit/support/temp-folder.h"

namespace {

using namespace std::string_literals;

constexpr const char *ADDRESS = "00:11:22:33:44:55\n";
const std::string ADDRESS_LINE = "macaddr=00:11:22:33:44:55\n";

struct copy_st
{
    int m_status;
    std::string m_text;
};

copy_st copy(const std::string &source, const char *address)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("source"), source);
    const pub_file_st in(folder.path("source").c_str(), pub_file_mode_en::READ);
    const pub_file_st out(folder.path("copy").c_str(), pub_file_mode_en::RENEW);
    const int status = amt_nvram_copy(in, out, address);
    return {status, read_whole_file(folder.path("copy"))};
}

/* Writes into a std::string, but says that the first piece could not be written. */
ssize_t lose_first_piece(void *taken_ptr, const char *data, size_t size)
{
    std::string &taken = *static_cast<std::string *>(taken_ptr);
    if (taken.empty()) {
        taken = "lost ";
        errno = ENOSPC;
        return 0;
    }
    taken.append(data, size);
    return static_cast<ssize_t>(size);
}

std::string make_lines(int count)
{
    std::string text;
    for (int i = 1; i <= count; i++) {
        text += "key" + std::to_string(i) + "=1\n";
    }
    return text;
}

TEST(nvram_file, replaces_the_address_line_where_it_stands)
{
    const log_capture_c capture;
    const copy_st done = copy("boardtype=1\nmacaddr=aa:bb\nend=2\n", ADDRESS);
    EXPECT_EQ(done.m_status, PUB_ERR_NONE);
    EXPECT_EQ(done.m_text, "boardtype=1\n" + ADDRESS_LINE + "end=2\n");
    EXPECT_EQ(capture.texts(), (std::vector<std::string>{"wifi_addr_nvram: aa:bb\n"}));
}

TEST(nvram_file, leading_blanks_are_part_of_an_address_line)
{
    EXPECT_EQ(copy("a=1\n  macaddr=aa:bb\n", ADDRESS).m_text, "a=1\n" + ADDRESS_LINE);
}

TEST(nvram_file, replaces_every_address_line)
{
    EXPECT_EQ(copy("macaddr=1\na=1\nmacaddr=2\n", ADDRESS).m_text, ADDRESS_LINE + "a=1\n" + ADDRESS_LINE);
}

TEST(nvram_file, a_comment_is_copied_and_the_address_appended)
{
    const log_capture_c capture;
    const copy_st done = copy("#macaddr=aa:bb\nend=2\n", ADDRESS);
    EXPECT_EQ(done.m_status, PUB_ERR_NONE);
    EXPECT_EQ(done.m_text, "#macaddr=aa:bb\nend=2\n" + ADDRESS_LINE);
    EXPECT_EQ(capture.texts(), (std::vector<std::string>{"new wifi_addr_nvram: 00:11:22:33:44:55\n"}));
}

TEST(nvram_file, the_key_counts_at_the_start_only)
{
    const std::string source = "il0macaddr=00:90\n # macaddr=1\n\tmacaddr=2\nMACADDR=3\n";
    EXPECT_EQ(copy(source, ADDRESS).m_text, source + ADDRESS_LINE);
}

TEST(nvram_file, appends_right_behind_a_source_without_a_last_line_feed)
{
    EXPECT_EQ(copy("end=2", ADDRESS).m_text, "end=2" + ADDRESS_LINE);
}

TEST(nvram_file, a_source_of_nothing_gets_the_address)
{
    EXPECT_EQ(copy("", ADDRESS).m_text, ADDRESS_LINE);
}

TEST(nvram_file, without_a_stored_address_nothing_changes)
{
    const log_capture_c capture;
    const std::string source = "a=1\nmacaddr=aa:bb\n\nb\0c\r\nend"s;
    const copy_st done = copy(source, "");
    EXPECT_EQ(done.m_status, PUB_ERR_NONE);
    EXPECT_EQ(done.m_text, source);
    EXPECT_TRUE(capture.texts().empty());
}

TEST(nvram_file, the_old_value_is_logged_up_to_59_characters)
{
    const log_capture_c capture;
    copy("macaddr=" + std::string(59, 'x') + "yz\n", ADDRESS);
    EXPECT_EQ(capture.texts(), (std::vector<std::string>{"wifi_addr_nvram: " + std::string(59, 'x')}));
}

TEST(nvram_file, a_long_line_counts_by_its_pieces)
{
    const std::string head(98, '#');
    EXPECT_EQ(copy(head + "macaddr=1\n", ADDRESS).m_text, head + ADDRESS_LINE);
    EXPECT_EQ(copy("macaddr=" + std::string(90, 'x') + "rest\n", ADDRESS).m_text, ADDRESS_LINE + "rest\n");
    EXPECT_EQ(copy(std::string(98 * 99, '#'), "").m_status, PUB_ERR_NONE);
    EXPECT_EQ(copy(std::string(98 * 99 + 1, '#'), "").m_status, PUB_ERR_FAIL);
}

struct count_case_st
{
    int m_lines;
    int m_copied;
    int m_status;
};

class nvram_file_count : public testing::TestWithParam<count_case_st> {};

TEST_P(nvram_file_count, fails_from_100_ordinary_lines_on_and_cuts_behind_them)
{
    const count_case_st expected = GetParam();
    const copy_st plain = copy(make_lines(expected.m_lines), "");
    EXPECT_EQ(plain.m_status, expected.m_status);
    EXPECT_EQ(plain.m_text, make_lines(expected.m_copied));

    const copy_st appended = copy(make_lines(expected.m_lines), ADDRESS);
    EXPECT_EQ(appended.m_status, expected.m_status);
    EXPECT_EQ(appended.m_text, make_lines(expected.m_copied) + ADDRESS_LINE);
}

INSTANTIATE_TEST_SUITE_P(limits, nvram_file_count,
                         testing::Values(count_case_st{98, 98, PUB_ERR_NONE},
                                         count_case_st{99, 99, PUB_ERR_NONE},
                                         count_case_st{100, 100, PUB_ERR_FAIL},
                                         count_case_st{101, 100, PUB_ERR_FAIL},
                                         count_case_st{5000, 100, PUB_ERR_FAIL}));

TEST(nvram_file, a_cut_is_logged)
{
    const log_capture_c capture;
    copy(make_lines(99), "");
    EXPECT_TRUE(capture.texts().empty());
    copy(make_lines(100), "");
    EXPECT_EQ(capture.texts().size(), 1U);
    EXPECT_EQ(capture.count_containing("FUNC-amt_write_wifi_to_nvram_file(), error_code=-100, "), 1);
}

TEST(nvram_file, a_full_file_system_is_a_failure)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("source"), "a=1\n");
    const pub_file_st in(folder.path("source").c_str(), pub_file_mode_en::READ);
    const pub_file_st out("/dev/full", pub_file_mode_en::RENEW);
    const log_capture_c capture;
    EXPECT_EQ(amt_nvram_copy(in, out, ""), PUB_ERR_FAIL);
    EXPECT_EQ(without_line_numbers(capture),
              (std::vector<std::string>{
                  error_line("amt/amt-handle", "amt_write_wifi_to_nvram_file", PUB_ERR_FAIL, ENOSPC),
                  "sys call: fputs() failed! errno = " + std::to_string(ENOSPC)}));
}

TEST(nvram_file, a_piece_that_is_lost_is_a_failure_though_the_rest_is_written)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("source"), "a=1\nb=2\n");
    const pub_file_st in(folder.path("source").c_str(), pub_file_mode_en::READ);
    pub_file_st out("/dev/null", pub_file_mode_en::RENEW);
    fclose(out.m_stream_ptr);
    std::string taken;
    const cookie_io_functions_t functions = {nullptr, lose_first_piece, nullptr, nullptr};
    out.m_stream_ptr = fopencookie(&taken, "w", functions);
    setvbuf(out.m_stream_ptr, nullptr, _IONBF, 0);
    EXPECT_EQ(amt_nvram_copy(in, out, ""), PUB_ERR_FAIL);
    EXPECT_EQ(taken, "lost b=2\n");
}

TEST(nvram_file, address_lines_are_not_counted)
{
    const copy_st done = copy(make_lines(50) + "macaddr=1\n" + make_lines(49), ADDRESS);
    EXPECT_EQ(done.m_status, PUB_ERR_NONE);
    EXPECT_EQ(done.m_text, make_lines(50) + ADDRESS_LINE + make_lines(49));
}

TEST(nvram_file, without_a_stored_address_an_address_line_is_an_ordinary_one)
{
    EXPECT_EQ(copy(make_lines(98) + "macaddr=1\n", "").m_status, PUB_ERR_NONE);
    EXPECT_EQ(copy(make_lines(99) + "macaddr=1\n", "").m_status, PUB_ERR_FAIL);
}

TEST(nvram_file, an_address_line_behind_the_cut_is_not_seen)
{
    EXPECT_EQ(copy(make_lines(100) + "macaddr=1\n", ADDRESS).m_text, make_lines(100) + ADDRESS_LINE);
}

} // namespace
