#include "amt/amt-handle/request/line-file.h"

#include <errno.h>
#include <gtest/gtest.h>
#include <string.h>
#include <vector>

#include "tests/unit/support/temp-folder.h"

namespace {

using namespace std::string_literals;

std::vector<std::string> get_all(const std::string &content)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("text"), content);
    FILE *const stream = fopen(folder.path("text").c_str(), "r");
    std::vector<std::string> line_list;
    char line_a[AMT_LINE_SIZE];
    for (uint32_t length = 0; (length = amt_line_get(stream, line_a)) > 0;) {
        EXPECT_EQ(line_a[length], '\0');
        line_list.emplace_back(line_a, length);
    }
    fclose(stream);
    return line_list;
}

TEST(line_file, keeps_the_line_feed_and_takes_a_last_line_without_one)
{
    EXPECT_EQ(get_all("one\n\ntwo\r\nthree"), (std::vector<std::string>{"one\n", "\n", "two\r\n", "three"}));
    EXPECT_TRUE(get_all("").empty());
}

TEST(line_file, gives_a_line_of_98_in_one_piece_and_a_longer_one_in_pieces)
{
    const std::string a97(97, 'a');
    EXPECT_EQ(get_all(a97 + "\n"), (std::vector<std::string>{a97 + "\n"}));
    EXPECT_EQ(get_all(a97 + "b\n"), (std::vector<std::string>{a97 + "b", "\n"}));
    EXPECT_EQ(get_all(a97 + "bc\nd\n"), (std::vector<std::string>{a97 + "b", "c\n", "d\n"}));
    EXPECT_EQ(get_all(std::string(196, 'a')), (std::vector<std::string>{a97 + "a", a97 + "a"}));
}

TEST(line_file, counts_zero_bytes)
{
    EXPECT_EQ(get_all("a\0b\nc\n"s), (std::vector<std::string>{"a\0b\n"s, "c\n"}));
}

TEST(line_file, reads_the_first_line_only)
{
    const temp_folder_c folder;
    const std::string path = folder.path("text");
    write_whole_file(path, "first\nsecond\n");
    char line_a[AMT_LINE_SIZE];
    EXPECT_EQ(amt_line_file_read(path.c_str(), line_a), amt_line_step_en::DONE);
    EXPECT_STREQ(line_a, "first\n");
}

TEST(line_file, tells_a_missing_from_an_unreadable_and_an_empty_file)
{
    const temp_folder_c folder;
    char line_a[AMT_LINE_SIZE] = "old";
    EXPECT_EQ(amt_line_file_read(folder.path("none").c_str(), line_a), amt_line_step_en::OPEN_FAILED);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_STREQ(line_a, "");

    EXPECT_EQ(amt_line_file_read(folder.path("").c_str(), line_a), amt_line_step_en::READ_FAILED);
    EXPECT_EQ(errno, EISDIR);

    write_whole_file(folder.path("empty"), "");
    EXPECT_EQ(amt_line_file_read(folder.path("empty").c_str(), line_a), amt_line_step_en::READ_FAILED);
    EXPECT_EQ(errno, 0);
    EXPECT_STREQ(line_a, "");
}

TEST(line_file, copy_cuts_and_terminates)
{
    char text_a[8];
    memset(text_a, 'x', sizeof(text_a));
    amt_line_copy(text_a, 5, "1234");
    EXPECT_STREQ(text_a, "1234");
    amt_line_copy(text_a, 5, "12345");
    EXPECT_STREQ(text_a, "1234");
    EXPECT_EQ(text_a[5], 'x');
    amt_line_copy(text_a, 1, "12345");
    EXPECT_STREQ(text_a, "");
}

} // namespace
