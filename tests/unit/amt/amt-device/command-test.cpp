#include "amt/amt-device/device-file.h"

#include <string>

#include <gtest/gtest.h>

#include "pub/error.h"
#include "pub/util/process.h"
#include "tests/unit/amt/amt-device/shell-record.h"
#include "tests/unit/support/log-lines.h"
#include "tests/unit/support/temp-folder.h"

namespace {

/* Adds a letter to the file and fails until it holds so many. */
std::string counting_command(const std::string &path, int successful_attempt)
{
    return "printf x >> " + path + "; test $(wc -c < " + path + ") -ge " + std::to_string(successful_attempt);
}

std::string fail_text(const std::string &command, int attempt)
{
    return "system(" + command + ") FAIL[count = " + std::to_string(attempt) + "]: 0 - Success";
}

std::vector<std::string> fail_lines(const std::string &command, int count)
{
    std::vector<std::string> lines;
    for (int attempt = 1; attempt <= count; attempt++) {
        lines.push_back(error_line("amt/amt-device", "amt_device_do_command", PUB_ERR_FILE));
        lines.push_back(fail_text(command, attempt));
    }
    return lines;
}

TEST(do_command, one_success_is_one_line)
{
    const log_capture_c capture;
    EXPECT_EQ(amt_device_do_command("true"), PUB_ERR_NONE);
    EXPECT_EQ(capture.texts(), std::vector<std::string>{"system(true) OK"});
}

TEST(do_command, success_on_the_third_run)
{
    const temp_folder_c folder;
    const std::string command = counting_command(folder.path("count"), 3);
    const log_capture_c capture;
    EXPECT_EQ(amt_device_do_command(command.c_str()), PUB_ERR_NONE);
    std::vector<std::string> expected = fail_lines(command, 2);
    expected.push_back("system(" + command + ") OK");
    EXPECT_EQ(without_line_numbers(capture), expected);
    EXPECT_EQ(read_whole_file(folder.path("count")), "xxx");
}

TEST(do_command, success_on_the_fifth_run)
{
    const temp_folder_c folder;
    const std::string command = counting_command(folder.path("count"), 5);
    EXPECT_EQ(amt_device_do_command(command.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(folder.path("count")), "xxxxx");
}

TEST(do_command, gives_up_after_the_fifth_run)
{
    const temp_folder_c folder;
    const std::string command = counting_command(folder.path("count"), 6);
    const log_capture_c capture;
    EXPECT_EQ(amt_device_do_command(command.c_str()), PUB_ERR_FAIL);
    EXPECT_EQ(without_line_numbers(capture), fail_lines(command, 5));
    EXPECT_EQ(read_whole_file(folder.path("count")), "xxxxx");
}

TEST(run, runs_once_whatever_comes_of_it)
{
    const temp_folder_c folder;
    const log_capture_c capture;
    pub_util_run_shell(counting_command(folder.path("count"), 6).c_str());
    EXPECT_EQ(read_whole_file(folder.path("count")), "x");
    EXPECT_TRUE(capture.texts().empty());
}

} // namespace
