#include "amt/amt-device/device-file.h"

#include <errno.h>
#include <string.h>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/support/log-lines.h"
#include "tests/unit/support/temp-folder.h"

namespace {

constexpr char HANDLER[] = "some_handler";

std::vector<std::string> failure_lines(int error_number, const std::string &text)
{
    return {error_line("amt/amt-device", HANDLER, PUB_ERR_FILE, error_number), text};
}

TEST(device_file, reads_the_number_without_a_word)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("voltage"), "4012345\n");
    const log_capture_c capture;
    int32_t value = 0;
    EXPECT_EQ(amt_device_file_read_int(folder.path("voltage").c_str(), &value, {g_amt_device_log, HANDLER}),
              PUB_ERR_NONE);
    EXPECT_EQ(value, 4012345);
    EXPECT_TRUE(capture.texts().empty());
}

TEST(device_file, tells_a_missing_file)
{
    const temp_folder_c folder;
    const std::string path = folder.path("missing");
    const log_capture_c capture;
    int32_t value = 5;
    EXPECT_EQ(amt_device_file_read_int(path.c_str(), &value, {g_amt_device_log, HANDLER}), PUB_ERR_FILE);
    EXPECT_EQ(value, 5);
    EXPECT_EQ(without_line_numbers(capture),
              failure_lines(ENOENT, "Open file \"" + path + "\" fail: 2 - No such file or directory"));
}

TEST(device_file, tells_other_text_and_an_empty_file)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("text"), "full\n");
    write_whole_file(folder.path("empty"), "");
    int32_t value = 5;
    {
        const log_capture_c capture;
        EXPECT_EQ(amt_device_file_read_int(folder.path("text").c_str(), &value, {g_amt_device_log, HANDLER}),
                  PUB_ERR_FILE);
        EXPECT_EQ(without_line_numbers(capture), failure_lines(0, "fscanf() return: 0; 0 - Success"));
    }
    const log_capture_c capture;
    EXPECT_EQ(amt_device_file_read_int(folder.path("empty").c_str(), &value, {g_amt_device_log, HANDLER}),
              PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture), failure_lines(0, "fscanf() return: -1; 0 - Success"));
    EXPECT_EQ(value, 5);
}

TEST(device_file, tells_a_failing_read)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    int32_t value = 5;
    EXPECT_EQ(amt_device_file_read_int(folder.path("").c_str(), &value, {g_amt_device_log, HANDLER}),
              PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture),
              failure_lines(EISDIR, "fscanf() return: -1; 21 - Is a directory"));
}

TEST(device_file, writes_the_bare_number_over_what_was_there)
{
    const temp_folder_c folder;
    write_whole_file(folder.path("enable"), "something longer\n");
    const log_capture_c capture;
    EXPECT_EQ(amt_device_file_write_int(folder.path("enable").c_str(), 3000, {g_amt_device_log, HANDLER}),
              PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(folder.path("enable")), "3000");
    EXPECT_EQ(amt_device_file_write_int(folder.path("enable").c_str(), -1, {g_amt_device_log, HANDLER}),
              PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(folder.path("enable")), "-1");
    EXPECT_EQ(amt_device_file_write_int(folder.path("enable").c_str(), 0, {g_amt_device_log, HANDLER}),
              PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(folder.path("enable")), "0");
    EXPECT_TRUE(capture.texts().empty());
}

TEST(device_file, tells_a_file_that_cannot_be_opened_for_writing)
{
    const temp_folder_c folder;
    const std::string path = folder.path("no/such/folder");
    const log_capture_c capture;
    EXPECT_EQ(amt_device_file_write_int(path.c_str(), 1, {g_amt_device_log, HANDLER}), PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture),
              failure_lines(ENOENT, "Open file \"" + path + "\" fail: 2 - No such file or directory"));
}

/* A driver refuses in the write itself; so does this device. */
TEST(device_file, tells_a_refused_write)
{
    const log_capture_c capture;
    EXPECT_EQ(amt_device_file_write_int("/dev/full", 1, {g_amt_device_log, HANDLER}), PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture),
              failure_lines(ENOSPC, "fprintf() return: -1; 28 - No space left on device"));
}

} // namespace
