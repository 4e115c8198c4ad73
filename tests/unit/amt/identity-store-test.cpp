#include "amt/amt-handle/request/identity-store.h"

#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <string.h>
#include <sys/stat.h>

#include "pub/error.h"
#include "tests/unit/amt/amt-device/shell-record.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace {

using testing::ElementsAre;
using testing::MatchesRegex;

/* The error line of an operation, whatever line of the source it names. */
auto is_error_line(const std::string &func, int code, int error_number)
{
    return MatchesRegex("FILE-amt/amt-handle, LINE-[0-9]+, FUNC-" + func + "\\(\\), error_code=" +
                        std::to_string(code) + ", errno=" + std::to_string(error_number));
}

auto is_error_line(const std::string &func, int code)
{
    return MatchesRegex("FILE-amt/amt-handle, LINE-[0-9]+, FUNC-" + func +
                        "\\(\\), error_code=" + std::to_string(code) + ", errno=-?[0-9]+");
}

TEST(write_pcba_sn, writes_the_text_without_a_line_end)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("sn.txt");
    EXPECT_EQ(amt_write_pcba_sn("SN%d", path.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(path), "SN%d");
    EXPECT_THAT(capture.texts(), ElementsAre("amt_write_pcba_sn()", "write pcba-sn: SN%d"));
    EXPECT_EQ(capture.records().back().m_tag, "vx-kel-amt");
    EXPECT_EQ(capture.records().back().m_priority, 3);
}

TEST(write_pcba_sn, refuses_no_text)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("sn.txt");
    EXPECT_EQ(amt_write_pcba_sn(nullptr, path.c_str()), PUB_ERR_PARAM);
    EXPECT_EQ(amt_write_pcba_sn("", path.c_str()), PUB_ERR_PARAM);
    EXPECT_EQ(read_whole_file(path), "(missing)");
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_write_pcba_sn()", is_error_line("amt_write_pcba_sn", -101), "1, 0",
                            "amt_write_pcba_sn()", is_error_line("amt_write_pcba_sn", -101), "0, 1"));
}

TEST(write_pcba_sn, reports_a_file_that_cannot_be_opened)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("none/sn.txt");
    EXPECT_EQ(amt_write_pcba_sn("1", path.c_str()), PUB_ERR_FILE);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_write_pcba_sn()", is_error_line("amt_write_pcba_sn", -118, ENOENT),
                            "open(\"" + path + "\") fail: 2 - " + strerror(ENOENT)));
}

TEST(write_pcba_sn, reports_a_failed_write_with_its_errno)
{
    const log_capture_c capture;
    EXPECT_EQ(amt_write_pcba_sn("1", "/dev/full"), PUB_ERR_FILE);
    EXPECT_EQ(errno, ENOSPC);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_write_pcba_sn()", is_error_line("amt_write_pcba_sn", -118, ENOSPC),
                            "fputs fail: 28 - " + std::string(strerror(ENOSPC))));
}

TEST(read_data_from_file, keeps_the_line_feed_and_clears_the_rest)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("state");
    write_whole_file(path, "CONFIGURED\nrest\n");
    char text_a[100];
    memset(text_a, 'x', sizeof(text_a));
    EXPECT_EQ(amt_read_data_from_file(text_a, sizeof(text_a), path.c_str()), PUB_ERR_NONE);
    EXPECT_STREQ(text_a, "CONFIGURED\n");
    EXPECT_EQ(text_a[sizeof(text_a) - 1], '\0');
    EXPECT_THAT(capture.texts(), ElementsAre("amt_read_data_from_file()", "read content: CONFIGURED\n"));
}

TEST(read_data_from_file, cuts_to_98_characters_and_to_the_buffer)
{
    const temp_folder_c folder;
    const std::string path = folder.path("long");
    write_whole_file(path, std::string(200, 'a') + "\n");
    char text_a[200];
    EXPECT_EQ(amt_read_data_from_file(text_a, sizeof(text_a), path.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(text_a, std::string(98, 'a'));
    EXPECT_EQ(amt_read_data_from_file(text_a, 99, path.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(text_a, std::string(98, 'a'));
    text_a[60] = 'x';
    EXPECT_EQ(amt_read_data_from_file(text_a, 60, path.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(text_a, std::string(59, 'a'));
    EXPECT_EQ(text_a[60], 'x');
    EXPECT_EQ(amt_read_data_from_file(text_a, 1, path.c_str()), PUB_ERR_NONE);
    EXPECT_STREQ(text_a, "");
}

TEST(read_data_from_file, reports_a_missing_and_an_empty_file)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string missing = folder.path("none");
    const std::string empty = folder.path("empty");
    write_whole_file(empty, "");
    char text_a[8] = "old";
    EXPECT_EQ(amt_read_data_from_file(text_a, sizeof(text_a), missing.c_str()), PUB_ERR_FILE);
    EXPECT_STREQ(text_a, "");
    EXPECT_EQ(amt_read_data_from_file(text_a, sizeof(text_a), empty.c_str()), PUB_ERR_FILE);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_read_data_from_file()",
                            is_error_line("amt_read_data_from_file", -118, ENOENT),
                            "open(\"" + missing + "\") fail: 2 - " + strerror(ENOENT),
                            "amt_read_data_from_file()", is_error_line("amt_read_data_from_file", -118, 0),
                            "read fail: 0 - " + std::string(strerror(0))));
}

TEST(read_data_from_file, refuses_an_absent_argument)
{
    char text_a[8] = "old";
    const log_capture_c capture;
    EXPECT_EQ(amt_read_data_from_file(nullptr, 8, "/dev/null"), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "1, 0, 0");
    EXPECT_EQ(amt_read_data_from_file(text_a, 0, "/dev/null"), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, 1, 0");
    EXPECT_EQ(amt_read_data_from_file(text_a, 8, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, 0, 1");
    EXPECT_STREQ(text_a, "old");
}

TEST(read_cut_line, cuts_the_last_character)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    for (const auto &[content, wanted] :
         {std::pair(std::string("12:34\n"), "12:34"), std::pair(std::string("12:34"), "12:3"),
          std::pair(std::string("\n"), ""), std::pair(std::string("\0\n", 2), "")})
    {
        write_whole_file(folder.path("line"), content);
        /* Of its own size on the heap, where a byte beside it would be found. */
        const auto buf = std::make_unique<char[]>(16);
        EXPECT_EQ(amt_read_cut_line(folder.path("line").c_str(), buf.get(), 16, "length"), PUB_ERR_NONE);
        EXPECT_STREQ(buf.get(), wanted);
    }
    EXPECT_THAT(capture.texts(), testing::IsSupersetOf({"length: 6", "length: 5", "length: 1", "length: 0"}));
}

TEST(make_folder, makes_a_missing_folder_that_all_may_write)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("BT");
    EXPECT_EQ(amt_make_folder(path.c_str()), PUB_ERR_NONE);
    struct stat status = {};
    ASSERT_EQ(stat(path.c_str(), &status), 0);
    EXPECT_TRUE(S_ISDIR(status.st_mode));
    EXPECT_EQ(status.st_mode & 07777, 0766U);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_make_folder()", "amt_make_folder: " + path + " does not exist.\r\n",
                            "amt_make_folder mkdir(" + path + ") successfully"));
}

TEST(make_folder, gives_it_to_the_radio_s_group)
{
    const temp_folder_c folder;
    const shell_record_c shell;
    const std::string path = folder.path("BT");
    EXPECT_EQ(amt_make_folder(path.c_str()), PUB_ERR_NONE);
    EXPECT_THAT(shell.m_commands, ElementsAre("chgrp -R radio " + path, "chmod 766 " + path));
}

TEST(make_folder, leaves_an_existing_folder_as_it_is)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("BT");
    ASSERT_EQ(mkdir(path.c_str(), 0700), 0);
    EXPECT_EQ(amt_make_folder(path.c_str()), PUB_ERR_NONE);
    struct stat status = {};
    ASSERT_EQ(stat(path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0700U);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_make_folder()", "amt_make_folder: " + path + " exist.\r\n"));
}

TEST(make_folder, anything_of_that_name_exists)
{
    const temp_folder_c folder;
    const std::string path = folder.path("BT");
    write_whole_file(path, "a file");
    EXPECT_EQ(amt_make_folder(path.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(path), "a file");
}

TEST(make_folder, reports_a_folder_that_cannot_be_made)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    const std::string path = folder.path("none/BT");
    EXPECT_EQ(amt_make_folder(path.c_str()), PUB_ERR_FILE);
    EXPECT_THAT(
        capture.texts(),
        ElementsAre("amt_make_folder()", "amt_make_folder: " + path + " does not exist.\r\n",
                    is_error_line("amt_make_folder", -118, ENOENT),
                    "amt_make_folder mkdir(" + path + ") faild errno[2] strerror[" + strerror(ENOENT) + "]"));
}

TEST(make_folder, refuses_an_absent_path)
{
    const log_capture_c capture;
    EXPECT_EQ(amt_make_folder(nullptr), PUB_ERR_PARAM);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_make_folder()", is_error_line("amt_make_folder", -101), "1"));
}

TEST(write_wifi_address, refuses_no_text)
{
    const log_capture_c capture;
    EXPECT_EQ(amt_write_wifi_address(nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(amt_write_wifi_address(""), PUB_ERR_PARAM);
    EXPECT_THAT(capture.texts(),
                ElementsAre("amt_write_wifi_address()", is_error_line("amt_write_wifi_address", -101), "1, 0",
                            "amt_write_wifi_address()", is_error_line("amt_write_wifi_address", -101),
                            "0, 1"));
}

} // namespace
