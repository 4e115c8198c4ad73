#include "pub/file/file.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "tests/unit/support/temp-folder.h"

namespace {

using namespace std::string_literals;

/* Room for a line of 98 characters. */
constexpr uint32_t LINE_SIZE = 99;

std::vector<std::string> get_all(const std::string &content)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("text"), content);
    const pub_file_st file(folder.path("text").c_str(), pub_file_mode_en::READ);
    std::vector<std::string> line_list;
    char line_a[LINE_SIZE];
    for (uint32_t length = 0; (length = pub_file_get_line(file, line_a, sizeof(line_a))) > 0;) {
        EXPECT_EQ(line_a[length], '\0');
        line_list.emplace_back(line_a, length);
    }
    return line_list;
}

TEST(file, lines_keep_the_line_feed_and_the_last_may_lack_it)
{
    EXPECT_EQ(get_all("one\n\ntwo\r\nthree"), (std::vector<std::string>{"one\n", "\n", "two\r\n", "three"}));
    EXPECT_TRUE(get_all("").empty());
}

TEST(file, gives_a_line_of_98_in_one_piece_and_a_longer_one_in_pieces)
{
    const std::string a97(97, 'a');
    EXPECT_EQ(get_all(a97 + "\n"), (std::vector<std::string>{a97 + "\n"}));
    EXPECT_EQ(get_all(a97 + "b\n"), (std::vector<std::string>{a97 + "b", "\n"}));
    EXPECT_EQ(get_all(a97 + "bc\nd\n"), (std::vector<std::string>{a97 + "b", "c\n", "d\n"}));
    EXPECT_EQ(get_all(std::string(196, 'a')), (std::vector<std::string>{a97 + "a", a97 + "a"}));
}

TEST(file, counts_zero_bytes_of_a_line)
{
    EXPECT_EQ(get_all("a\0b\nc\n"s), (std::vector<std::string>{"a\0b\n"s, "c\n"}));
}

TEST(file, reads_the_first_line_only_and_cuts_it_to_the_room)
{
    const temp_folder_c folder;
    const std::string path = folder.path("text");
    write_whole_file(path, "first\nsecond\n");
    char line_a[LINE_SIZE];
    EXPECT_EQ(pub_file_read_line(path.c_str(), line_a, sizeof(line_a)), pub_file_step_en::DONE);
    EXPECT_STREQ(line_a, "first\n");

    memset(line_a, 'x', sizeof(line_a));
    EXPECT_EQ(pub_file_read_line(path.c_str(), line_a, 5), pub_file_step_en::DONE);
    EXPECT_STREQ(line_a, "firs");
    EXPECT_EQ(line_a[5], 'x');
}

TEST(file, reads_the_first_word_only)
{
    const temp_folder_c folder;
    const std::string path = folder.path("text");
    write_whole_file(path, "\n first second\n");
    char word_a[LINE_SIZE];
    EXPECT_EQ(pub_file_read_word(path.c_str(), word_a, sizeof(word_a)), pub_file_step_en::DONE);
    EXPECT_STREQ(word_a, "first");
}

/* Both readers of a whole file tell the same faults apart. */
template <typename reader_t> void expect_reader_tells_faults(reader_t reader)
{
    const temp_folder_c folder;
    char text_a[LINE_SIZE] = "old";
    EXPECT_EQ(reader(folder.path("none").c_str(), text_a, LINE_SIZE), pub_file_step_en::OPEN_FAILED);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_STREQ(text_a, "");

    EXPECT_EQ(reader(folder.path("").c_str(), text_a, LINE_SIZE), pub_file_step_en::READ_FAILED);
    EXPECT_EQ(errno, EISDIR);

    write_whole_file(folder.path("empty"), "");
    errno = EXDEV;
    EXPECT_EQ(reader(folder.path("empty").c_str(), text_a, LINE_SIZE), pub_file_step_en::READ_FAILED);
    EXPECT_EQ(errno, 0);
    EXPECT_STREQ(text_a, "");
}

TEST(file, tells_a_missing_from_an_unreadable_and_an_empty_file)
{
    expect_reader_tells_faults(pub_file_read_line);
    expect_reader_tells_faults(pub_file_read_word);
}

TEST(file, writes_the_text_as_it_stands_in_place_of_what_was_there)
{
    const temp_folder_c folder;
    const std::string path = folder.path("text");
    write_whole_file(path, "0123456789\nsecond line\n");
    EXPECT_EQ(pub_file_write(path.c_str(), "A%sB\r"), pub_file_step_en::DONE);
    EXPECT_EQ(read_whole_file(path), "A%sB\r");
    EXPECT_EQ(pub_file_write(path.c_str(), "12", "\n"), pub_file_step_en::DONE);
    EXPECT_EQ(read_whole_file(path), "12\n");
}

TEST(file, tells_a_file_that_cannot_be_made_from_a_full_file_system)
{
    const temp_folder_c folder;
    EXPECT_EQ(pub_file_write(folder.path("no-such-folder/text").c_str(), "12"),
              pub_file_step_en::OPEN_FAILED);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(pub_file_write("/dev/full", "12"), pub_file_step_en::WRITE_FAILED);
    EXPECT_EQ(errno, ENOSPC);
}

TEST(file, update_writes_in_place_and_makes_no_file)
{
    const temp_folder_c folder;
    const std::string path = folder.path("text");
    EXPECT_FALSE(pub_file_st(path.c_str(), pub_file_mode_en::UPDATE).is_open());
    EXPECT_EQ(errno, ENOENT);
    write_whole_file(path, "0123");
    const pub_file_st file(path.c_str(), pub_file_mode_en::UPDATE);
    EXPECT_TRUE(pub_file_put(file, "ab"));
    EXPECT_EQ(read_whole_file(path), "ab23");
}

TEST(file, no_mode_leaves_the_descriptor_to_programs)
{
    const temp_folder_c folder;
    const std::string path = folder.path("text");
    for (const pub_file_mode_en mode :
         {pub_file_mode_en::WRITE, pub_file_mode_en::READ, pub_file_mode_en::UPDATE, pub_file_mode_en::RENEW})
    {
        const pub_file_st file(path.c_str(), mode);
        ASSERT_TRUE(file.is_open());
        EXPECT_EQ(fcntl(fileno(file.m_stream_ptr), F_GETFD), FD_CLOEXEC) << static_cast<int>(mode);
    }
}

TEST(file, closes_itself_and_keeps_errno)
{
    int fd = -1;
    {
        pub_file_st file("/dev/full", pub_file_mode_en::WRITE);
        fd = fileno(file.m_stream_ptr);
        EXPECT_NE(fputs("never leaves the stream", file.m_stream_ptr), EOF);
        errno = EXDEV;
    }
    EXPECT_EQ(errno, EXDEV);
    EXPECT_EQ(fcntl(fd, F_GETFD), -1);
}

TEST(file, closes_once)
{
    pub_file_st file("/dev/null", pub_file_mode_en::READ);
    const int fd = fileno(file.m_stream_ptr);
    pub_file_close(&file);
    EXPECT_FALSE(file.is_open());
    EXPECT_EQ(fcntl(fd, F_GETFD), -1);
    pub_file_close(&file);

    pub_file_open(&file, "/dev/null", pub_file_mode_en::READ);
    EXPECT_TRUE(file.is_open());
}

} // namespace
