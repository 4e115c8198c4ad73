#include "amt/amt-handle/channel/factory-file.h"

#include <chrono>
#include <errno.h>
#include <gtest/gtest.h>

#include "tests/unit/amt/amt-device/shell-record.h"
#include "tests/unit/support/temp-folder.h"

namespace {

using std::chrono::milliseconds;

/* What two pauses of 50 ms take at least. */
constexpr milliseconds FLUSH_TIME{100};

template <typename action_t> milliseconds time_of(action_t action)
{
    const auto start = std::chrono::steady_clock::now();
    action();
    return std::chrono::duration_cast<milliseconds>(std::chrono::steady_clock::now() - start);
}

TEST(factory_file, writes_the_text_as_it_stands_and_takes_the_time_of_a_flush)
{
    const temp_folder_c folder;
    const std::string path = folder.path("sn.txt");
    pub_file_step_en step = pub_file_step_en::OPEN_FAILED;
    EXPECT_GE(time_of([&] { step = amt_factory_file_write(path.c_str(), "A%sB\r"); }), FLUSH_TIME);
    EXPECT_EQ(step, pub_file_step_en::DONE);
    EXPECT_EQ(read_whole_file(path), "A%sB\r");
}

TEST(factory_file, replaces_a_longer_text)
{
    const temp_folder_c folder;
    const std::string path = folder.path("sn.txt");
    write_whole_file(path, "0123456789\nsecond line\n");
    EXPECT_EQ(amt_factory_file_write(path.c_str(), "12", "\n"), pub_file_step_en::DONE);
    EXPECT_EQ(read_whole_file(path), "12\n");
}

TEST(factory_file, a_file_that_cannot_be_opened_is_not_flushed)
{
    const temp_folder_c folder;
    const std::string path = folder.path("no-such-folder/sn.txt");
    pub_file_step_en step = pub_file_step_en::DONE;
    EXPECT_LT(time_of([&] { step = amt_factory_file_write(path.c_str(), "12"); }), FLUSH_TIME);
    EXPECT_EQ(step, pub_file_step_en::OPEN_FAILED);
    EXPECT_EQ(errno, ENOENT);
}

TEST(factory_file, a_full_file_system_is_a_failed_write_and_is_flushed_all_the_same)
{
    pub_file_step_en step = pub_file_step_en::DONE;
    EXPECT_GE(time_of([&] { step = amt_factory_file_write("/dev/full", "12"); }), FLUSH_TIME);
    EXPECT_EQ(step, pub_file_step_en::WRITE_FAILED);
    EXPECT_EQ(errno, ENOSPC);
}

TEST(factory_file, flush_keeps_errno)
{
    shell_record_c shell;
    shell.m_error = ECHILD;
    errno = EXDEV;
    EXPECT_GE(time_of(amt_factory_file_sync), FLUSH_TIME);
    EXPECT_EQ(errno, EXDEV);
    EXPECT_EQ(shell.m_commands, std::vector<std::string>(2, "/system/bin/sync"));
}

} // namespace
