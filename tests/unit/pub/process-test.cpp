#include "pub/util/util.h"

#include <algorithm>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <string.h>
#include <string>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "pub/log/log.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace {

const std::string CHECK_RUN = "pub_util_get_pid_and_check_run";

std::string util_error(const std::string &func, int error_code, int error_number)
{
    return error_line("util/util", func, error_code, error_number);
}

std::string open_line(const std::string &path, int error_number)
{
    return "Open file \"" + path + "\" fail: " + std::to_string(error_number) + " - " +
           strerror(error_number);
}

std::string write_pid_file(const temp_folder_c &dir, const std::string &content)
{
    std::string path = dir.path("p.pid");
    write_whole_file(path, content);
    return path;
}

struct check_run_st
{
    int m_status;
    int32_t m_is_run;
    int32_t m_pid;
    lines_t m_text_list;
};

/* Runs the check with outputs that hold something else before. */
check_run_st check_run(const std::string &pid_file, const std::string &name)
{
    const log_capture_c capture;
    check_run_st run = {0, 77, 88, {}};
    run.m_status = pub_util_get_pid_and_check_run(pid_file.c_str(), name.c_str(), &run.m_is_run, &run.m_pid);
    run.m_text_list = without_line_numbers(capture);
    return run;
}

/* The log of a check that found a number in the file and looked at its process. */
lines_t process_lines(const std::string &pid_file, const std::string &name, long pid,
                      const std::string &outcome, int is_run)
{
    const std::string found = std::to_string(pid);
    const std::string reported = is_run != 0 ? found : "0";
    return {
        CHECK_RUN + "()",
        CHECK_RUN + " pid_file_ptr[" + pid_file + "] name_ptr[" + name + "]",
        CHECK_RUN + " pid[" + found + "]",
        CHECK_RUN + " fopen buf_a[/proc/" + found + "/cmdline]",
        CHECK_RUN + " fscanf buf_a[" + outcome,
        CHECK_RUN + " return is_run_ptr[" + std::to_string(is_run) + "] pid_ptr[" + reported + "]",
    };
}

void expect_not_running(const check_run_st &run)
{
    EXPECT_EQ(run.m_status, PUB_ERR_NONE);
    EXPECT_EQ(run.m_is_run, 0);
    EXPECT_EQ(run.m_pid, 0);
    EXPECT_EQ(run.m_text_list.back(), CHECK_RUN + " return is_run_ptr[0] pid_ptr[0]");
}

} // namespace

TEST(check_run, process_with_the_name_in_its_program_runs)
{
    const temp_folder_c dir;
    const other_program_c program("/opt/x/some-daemon-2");
    const std::string pid_file = write_pid_file(dir, std::to_string(program.pid()) + "\n");
    const check_run_st run = check_run(pid_file, "some-daemon");
    EXPECT_EQ(run.m_status, PUB_ERR_NONE);
    EXPECT_EQ(run.m_is_run, 1);
    EXPECT_EQ(run.m_pid, program.pid());
    EXPECT_EQ(run.m_text_list,
              process_lines(pid_file, "some-daemon", program.pid(), "/opt/x/some-daemon-2] ret_val[1]", 1));
}

TEST(check_run, stale_file_names_another_program)
{
    const temp_folder_c dir;
    const other_program_c program("/opt/other");
    const std::string pid_file = write_pid_file(dir, std::to_string(program.pid()));
    const check_run_st run = check_run(pid_file, "some-daemon");
    expect_not_running(run);
    EXPECT_EQ(run.m_text_list,
              process_lines(pid_file, "some-daemon", program.pid(), "/opt/other] ret_val[1]", 0));
}

TEST(check_run, arguments_do_not_count)
{
    const temp_folder_c dir;
    const other_program_c program("/opt/other");
    expect_not_running(check_run(write_pid_file(dir, std::to_string(program.pid())), "60"));
}

TEST(check_run, program_ends_at_a_blank)
{
    const temp_folder_c dir;
    const other_program_c program("/my programs/some-daemon");
    const std::string pid_file = write_pid_file(dir, std::to_string(program.pid()));
    const check_run_st run = check_run(pid_file, "some-daemon");
    expect_not_running(run);
    EXPECT_EQ(run.m_text_list[4], CHECK_RUN + " fscanf buf_a[/my] ret_val[1]");
}

TEST(check_run, program_is_read_up_to_79_characters)
{
    const temp_folder_c dir;
    const std::string folder = "/" + std::string(73, 'd') + "/"; /* 75 characters */
    const other_program_c fitting(folder + "name");
    EXPECT_EQ(check_run(write_pid_file(dir, std::to_string(fitting.pid())), "name").m_is_run, 1);
    const other_program_c cut(folder + "xname");
    const check_run_st run = check_run(write_pid_file(dir, std::to_string(cut.pid())), "name");
    expect_not_running(run);
    EXPECT_EQ(run.m_text_list[4], CHECK_RUN + " fscanf buf_a[" + folder + "xnam] ret_val[1]");
}

TEST(check_run, process_that_has_ended_has_no_command_line)
{
    const temp_folder_c dir;
    const other_program_c program("/opt/some-daemon", true);
    const std::string pid = std::to_string(program.pid());
    const std::string pid_file = write_pid_file(dir, pid);
    /* The buffer still holds the path then, which is no program: its "cmdline" must not count. */
    const check_run_st run = check_run(pid_file, "cmdline");
    expect_not_running(run);
    EXPECT_EQ(run.m_text_list,
              process_lines(pid_file, "cmdline", program.pid(), "/proc/" + pid + "/cmdline] ret_val[-1]", 0));
}

TEST(check_run, process_that_is_gone)
{
    const temp_folder_c dir;
    /* The longest number that is read is as wide as the machine's long allows. */
    for (const std::string &pid :
         {std::string("2147483647"), std::to_string(LONG_MAX / 10), std::string("-5")}) {
        const std::string pid_file = write_pid_file(dir, pid);
        const check_run_st run = check_run(pid_file, "some-daemon");
        expect_not_running(run);
        const std::string path = "/proc/" + pid + "/cmdline";
        ASSERT_EQ(run.m_text_list.size(), 7U);
        EXPECT_EQ(run.m_text_list[3], CHECK_RUN + " fopen buf_a[" + path + "]");
        EXPECT_EQ(run.m_text_list[4], util_error(CHECK_RUN, -118, ENOENT));
        EXPECT_EQ(run.m_text_list[5], open_line(path, ENOENT));
    }
}

TEST(check_run, file_that_is_missing)
{
    const temp_folder_c dir;
    const std::string pid_file = dir.path("none.pid");
    const check_run_st run = check_run(pid_file, "some-daemon");
    expect_not_running(run);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre(CHECK_RUN + "()",
                                     CHECK_RUN + " pid_file_ptr[" + pid_file + "] name_ptr[some-daemon]",
                                     util_error(CHECK_RUN, -118, ENOENT), open_line(pid_file, ENOENT),
                                     CHECK_RUN + " return is_run_ptr[0] pid_ptr[0]"));
}

TEST(check_run, file_without_a_number)
{
    const temp_folder_c dir;
    for (const std::string content : {"not a number", "", "\n"}) {
        const check_run_st run = check_run(write_pid_file(dir, content), "some-daemon");
        expect_not_running(run);
        const std::string scanned = content == "not a number" ? "0" : "-1";
        ASSERT_EQ(run.m_text_list.size(), 5U);
        EXPECT_EQ(run.m_text_list[2], util_error(CHECK_RUN, -118, 0));
        EXPECT_EQ(run.m_text_list[3], "fscanf() return: " + scanned + "; 0 - Success");
    }
}

TEST(check_run, file_that_cannot_be_read)
{
    const temp_folder_c dir;
    const check_run_st run = check_run(dir.path("."), "some-daemon");
    expect_not_running(run);
    ASSERT_EQ(run.m_text_list.size(), 5U);
    EXPECT_EQ(run.m_text_list[2], util_error(CHECK_RUN, -118, EISDIR));
    EXPECT_EQ(run.m_text_list[3], std::string("fscanf() return: -1; 21 - ") + strerror(EISDIR));
}

TEST(check_run, very_long_number)
{
    const temp_folder_c dir;
    expect_not_running(check_run(write_pid_file(dir, std::string(100000, '9')), "some-daemon"));
}

TEST(check_run, number_with_leading_zeros)
{
    const temp_folder_c dir;
    const other_program_c program("/opt/some-daemon");
    const std::string pid_file = write_pid_file(dir, std::string(30, '0') + std::to_string(program.pid()));
    const check_run_st run = check_run(pid_file, "some-daemon");
    EXPECT_EQ(run.m_is_run, 1);
    EXPECT_EQ(run.m_pid, program.pid());
}

TEST(check_run, zero_is_a_number)
{
    const temp_folder_c dir;
    const std::string pid_file = write_pid_file(dir, "0\n");
    const check_run_st run = check_run(pid_file, "some-daemon");
    expect_not_running(run);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre("pub_util_get_pid_and_check_run()",
                                     CHECK_RUN + " pid_file_ptr[" + pid_file + "] name_ptr[some-daemon]",
                                     CHECK_RUN + " pid[0]", CHECK_RUN + " fopen buf_a[/proc/0/cmdline]",
                                     util_error(CHECK_RUN, -118, ENOENT),
                                     open_line("/proc/0/cmdline", ENOENT),
                                     CHECK_RUN + " return is_run_ptr[0] pid_ptr[0]"));
}

TEST(check_run, absent_and_empty_arguments)
{
    int32_t is_run = 77;
    int32_t pid = 88;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_get_pid_and_check_run(nullptr, "n", &is_run, &pid), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_pid_and_check_run("", "n", &is_run, &pid), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_pid_and_check_run("f", nullptr, &is_run, &pid), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_pid_and_check_run("f", "", &is_run, &pid), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_pid_and_check_run("f", "n", nullptr, &pid), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_pid_and_check_run("f", "n", &is_run, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(is_run, 77);
    EXPECT_EQ(pid, 88);
    lines_t expected_list;
    for (const char *flags : {"1, 0, 0, 0, 0, 0", "0, 1, 0, 0, 0, 0", "0, 0, 1, 0, 0, 0", "0, 0, 0, 1, 0, 0",
                              "0, 0, 0, 0, 1, 0", "0, 0, 0, 0, 0, 1"})
    {
        expected_list.insert(expected_list.end(), {CHECK_RUN + "()", util_error(CHECK_RUN, -101, 0), flags});
    }
    EXPECT_EQ(without_line_numbers(capture), expected_list);
}

TEST(pid_file, holds_the_own_process_id)
{
    const std::string pid = std::to_string(getpid());
    const std::string name = "vx-pub-test-" + pid;
    const std::string path = "/tmp/" + name + ".pid";
    const log_capture_c capture;
    EXPECT_EQ(pub_util_create_pid_file(name.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(path), pid + "\n");
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre("pub_util_create_pid_file()", "PID of " + name + ": " + pid));
    unlink(path.c_str());
}

TEST(pid_file, is_found_by_the_check)
{
    const std::string name = "vx-pub-test-" + std::to_string(getpid());
    const std::string path = "/tmp/" + name + ".pid";
    ASSERT_EQ(pub_util_create_pid_file(name.c_str()), PUB_ERR_NONE);
    char program_a[10];
    ASSERT_EQ(pub_util_get_cmd_line(getpid(), program_a, sizeof(program_a)), PUB_ERR_NONE);
    const check_run_st run = check_run(path, program_a);
    EXPECT_EQ(run.m_is_run, 1);
    EXPECT_EQ(run.m_pid, getpid());
    unlink(path.c_str());
}

TEST(pid_file, shell_command_is_cut_at_59_characters)
{
    const std::string name = "vx-pub-test-" + std::string(60, 'n');
    const std::string command = "echo " + std::to_string(getpid()) + " > /tmp/" + name + ".pid";
    const std::string path = command.substr(0, 59).substr(command.find('/'));
    EXPECT_EQ(pub_util_create_pid_file(name.c_str()), PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(path), std::to_string(getpid()) + "\n");
    unlink(path.c_str());
}

TEST(pid_file, failing_shell_is_no_error)
{
    const log_capture_c capture;
    EXPECT_EQ(pub_util_create_pid_file("vx-pub-none/x"), PUB_ERR_NONE);
    EXPECT_EQ(capture.texts().at(1), "PID of vx-pub-none/x: " + std::to_string(getpid()));
}

TEST(pid_file, absent_name)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_create_pid_file(nullptr), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("pub_util_create_pid_file()",
                                     util_error("pub_util_create_pid_file", -101, 0), "1"));
}

TEST(cmd_line, first_word_as_started)
{
    const other_program_c program("./some/program");
    char buf_a[32];
    memset(buf_a, '?', sizeof(buf_a));
    const log_capture_c capture;
    EXPECT_EQ(pub_util_get_cmd_line(program.pid(), buf_a, sizeof(buf_a)), PUB_ERR_NONE);
    EXPECT_STREQ(buf_a, "./some/program");
    EXPECT_EQ(std::count(buf_a + 14, buf_a + sizeof(buf_a), '\0'), 18) << "the whole destination is zeroed";
    EXPECT_THAT(capture.texts(), testing::ElementsAre("pub_util_get_cmd_line()"));
}

TEST(cmd_line, ends_at_a_blank)
{
    const other_program_c program(" two words");
    char buf_a[32];
    EXPECT_EQ(pub_util_get_cmd_line(program.pid(), buf_a, sizeof(buf_a)), PUB_ERR_NONE);
    EXPECT_STREQ(buf_a, "two");
}

TEST(cmd_line, is_cut_to_the_capacity)
{
    const other_program_c program("/0123456789");
    char buf_a[12];
    memset(buf_a, '?', sizeof(buf_a));
    EXPECT_EQ(pub_util_get_cmd_line(program.pid(), buf_a, 5), PUB_ERR_NONE);
    EXPECT_EQ(std::string(buf_a, sizeof(buf_a)), std::string("/012\0???????", 12));
    EXPECT_EQ(pub_util_get_cmd_line(program.pid(), buf_a, 1), PUB_ERR_NONE);
    EXPECT_STREQ(buf_a, "");
    EXPECT_EQ(pub_util_get_cmd_line(program.pid(), buf_a, sizeof(buf_a)), PUB_ERR_NONE);
    EXPECT_STREQ(buf_a, "/0123456789");
}

TEST(cmd_line, process_that_is_gone)
{
    char buf_a[8] = "old";
    const log_capture_c capture;
    EXPECT_EQ(pub_util_get_cmd_line(2147483647, buf_a, sizeof(buf_a)), PUB_ERR_FILE);
    EXPECT_STREQ(buf_a, "");
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("pub_util_get_cmd_line()",
                                     util_error("pub_util_get_cmd_line", -118, ENOENT),
                                     open_line("/proc/2147483647/cmdline", ENOENT)));
}

TEST(cmd_line, process_that_has_ended)
{
    const other_program_c program("/opt/some-daemon", true);
    char buf_a[8] = "old";
    const log_capture_c capture;
    EXPECT_EQ(pub_util_get_cmd_line(program.pid(), buf_a, sizeof(buf_a)), PUB_ERR_FILE);
    EXPECT_STREQ(buf_a, "");
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("pub_util_get_cmd_line()", sys_call_line("fscanf", 0),
                                     util_error("pub_util_get_cmd_line", -1, 0)));
}

TEST(cmd_line, absent_arguments)
{
    char buf_a[8] = "old";
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_get_cmd_line(getpid(), nullptr, 8), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_cmd_line(getpid(), buf_a, 0), PUB_ERR_PARAM);
    EXPECT_STREQ(buf_a, "old");
    const std::string error = util_error("pub_util_get_cmd_line", -101, 0);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("pub_util_get_cmd_line()", error, "1, 0", "pub_util_get_cmd_line()",
                                     error, "0, 1"));
}

TEST(process_path, is_the_command_line_up_to_the_last_slash)
{
    char command_a[256];
    char path_a[256];
    ASSERT_EQ(pub_util_get_cmd_line(getpid(), command_a, sizeof(command_a)), PUB_ERR_NONE);
    const log_capture_c capture;
    EXPECT_EQ(pub_util_get_process_path(path_a, sizeof(path_a)), PUB_ERR_NONE);
    const std::string command = command_a;
    EXPECT_EQ(path_a, command.substr(0, command.rfind('/')));
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre("pub_util_get_process_path()", "pub_util_get_cmd_line()"));
}

TEST(process_path, cut_text_ends_at_the_last_slash_that_is_left)
{
    char whole_a[256];
    ASSERT_EQ(pub_util_get_cmd_line(getpid(), whole_a, sizeof(whole_a)), PUB_ERR_NONE);
    const std::string whole = whole_a;
    for (uint32_t capacity = 1; capacity <= whole.size(); capacity++) {
        const std::string kept = whole.substr(0, capacity - 1);
        char path_a[256];
        EXPECT_EQ(pub_util_get_process_path(path_a, capacity), PUB_ERR_NONE);
        EXPECT_EQ(path_a, kept.substr(0, kept.rfind('/'))) << kept;
    }
}

TEST(process_path, absent_arguments)
{
    char buf_a[8] = "old";
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_get_process_path(nullptr, 8), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_process_path(buf_a, 0), PUB_ERR_PARAM);
    const std::string error = util_error("pub_util_get_process_path", -101, 0);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("pub_util_get_process_path()", error, "1, 0",
                                     "pub_util_get_process_path()", error, "0, 1"));
}

TEST(process_path, unreadable_command_line_is_passed_on)
{
    const child_run_st run = run_in_child([] {
        char buf_a[8];
        const rlimit none = {0, 0};
        setrlimit(RLIMIT_NOFILE, &none);
        return pub_util_get_process_path(buf_a, sizeof(buf_a));
    });
    EXPECT_EQ(run.m_result, PUB_ERR_FILE);
    ASSERT_EQ(run.m_text_list.size(), 4U);
    EXPECT_EQ(run.m_text_list[2], util_error("pub_util_get_cmd_line", -118, EMFILE));
}
