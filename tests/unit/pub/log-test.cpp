#include "pub/pub-log.h"

#include <errno.h>
#include <numeric>
#include <signal.h>
#include <string>
#include <sys/time.h>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/include/android/log.h"
#include "pub/error.h"
#include "tests/unit/support/log-capture.h"

namespace {

constexpr pub_log_source_st g_test_log{"some-tag", "some/source"};

volatile sig_atomic_t g_alarm_count = 0;

void log_on_alarm(int)
{
    pub_log_entry(g_test_log);
    g_alarm_count = g_alarm_count + 1;
}

std::string dump_text(uint32_t length)
{
    std::vector<uint8_t> data(length);
    std::iota(data.begin(), data.end(), static_cast<uint8_t>(0));
    const log_capture_c capture;
    pub_log_dump(g_test_log, "title", data.data(), length);
    return capture.texts().at(0);
}

/* The error line that the given function and line of this file are told in. */
std::string error_line_of(const std::string &func, int line, int code, int error_number)
{
    return "FILE-some/source, LINE-" + std::to_string(line) + ", FUNC-" + func +
           "(), error_code=" + std::to_string(code) + ", errno=" + std::to_string(error_number);
}

int fail_for_caller(const pub_log_place_st &place = g_test_log)
{
    return pub_log_fail(place, -118, "open(%s) fail: %d", "some file", errno);
}

} // namespace

TEST(log, sources_of_the_library)
{
    EXPECT_STREQ(g_pub_cfg_log.m_tag_ptr, "vx-kel-pub");
    EXPECT_STREQ(g_pub_cfg_log.m_name_ptr, "cfg/cfg");
    EXPECT_STREQ(g_pub_util_log.m_tag_ptr, "vx-kel-pub");
    EXPECT_STREQ(g_pub_util_log.m_name_ptr, "util/util");
    EXPECT_STREQ(g_pub_pty_log.m_tag_ptr, "vx-kel-pub");
    EXPECT_STREQ(g_pub_pty_log.m_name_ptr, "pty/pty");
}

TEST(log, record_has_debug_priority_and_the_source_s_tag)
{
    const log_capture_c capture;
    PUB_LOG(g_test_log, "%s %d", "text", 7);
    const std::vector<log_record_st> record_list = capture.records();
    ASSERT_EQ(record_list.size(), 1U);
    EXPECT_EQ(record_list[0].m_priority, ANDROID_LOG_DEBUG);
    EXPECT_EQ(record_list[0].m_tag, "some-tag");
    EXPECT_EQ(record_list[0].m_text, "text 7");
}

TEST(log, null_tag_and_percent_signs_in_arguments)
{
    const log_capture_c capture;
    PUB_LOG((pub_log_source_st{nullptr, ""}), "%s", "100 %s %n");
    ASSERT_EQ(capture.records().size(), 1U);
    EXPECT_EQ(capture.records()[0].m_tag, "(null)");
    EXPECT_EQ(capture.records()[0].m_text, "100 %s %n");
}

TEST(log, entry_names_the_function)
{
    const log_capture_c capture;
    pub_log_entry(g_test_log);
    EXPECT_THAT(capture.texts(), testing::ElementsAre("TestBody()"));
}

TEST(log, error_line)
{
    const log_capture_c capture;
    errno = EIO;
    pub_log_error(g_test_log, -118);
    const std::string line = std::to_string(__LINE__ - 1);
    EXPECT_THAT(capture.texts(), testing::ElementsAre("FILE-some/source, LINE-" + line +
                                                      ", FUNC-TestBody(), error_code=-118, errno=5"));
}

TEST(log, system_call_line)
{
    const log_capture_c capture;
    errno = ENOENT;
    pub_log_sys_call(g_test_log, "fopen");
    EXPECT_THAT(capture.texts(), testing::ElementsAre("sys call: fopen() failed! errno = 2"));
}

TEST(log, a_failure_is_the_callers_error_line_and_the_text)
{
    const log_capture_c capture;
    errno = EIO;
    EXPECT_EQ(pub_log_fail(g_test_log, -111, "100 %% of %d", 7), -111);
    const int line = __LINE__ - 1;
    EXPECT_EQ(fail_for_caller(), -118);
    EXPECT_EQ(fail_for_caller({g_test_log, "other", 5}), -118);
    EXPECT_EQ(errno, EIO);
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre(error_line_of("TestBody", line, -111, EIO), "100 % of 7",
                                     error_line_of("TestBody", line + 2, -118, EIO),
                                     "open(some file) fail: 5", error_line_of("other", 5, -118, EIO),
                                     "open(some file) fail: 5"));
}

TEST(log, the_text_of_a_failure_holds_a_whole_command)
{
    const log_capture_c capture;
    const std::string command(4096, 'x');
    pub_log_fail(g_test_log, -1, "system(%s)", command.c_str());
    EXPECT_EQ(capture.texts()[1], "system(" + command + ")");
    pub_log_fail(g_test_log, -1, "%s", std::string(5000, 'y').c_str());
    EXPECT_EQ(capture.texts()[3], std::string(4351, 'y'));
}

TEST(log, the_lines_of_a_failed_call_come_in_the_order_of_the_name)
{
    const log_capture_c capture;
    errno = ENOENT;
    EXPECT_EQ(pub_log_error_call(g_test_log, -1, "read"), -1);
    const int line = __LINE__ - 1;
    EXPECT_EQ(pub_log_call_error(g_test_log, "write", -118), -118);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_THAT(capture.texts(), testing::ElementsAre(error_line_of("TestBody", line, -1, ENOENT),
                                                      "sys call: read() failed! errno = 2",
                                                      "sys call: write() failed! errno = 2",
                                                      error_line_of("TestBody", line + 2, -118, ENOENT)));
}

TEST(log, a_refused_call_shows_what_was_at_fault)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_log_bad_param(g_test_log, {false, true}), PUB_ERR_PARAM);
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre(error_line_of("TestBody", __LINE__ - 2, PUB_ERR_PARAM, 0), "0, 1"));
}

TEST(log, flags_line)
{
    const log_capture_c capture;
    pub_log_flags(g_test_log, {true});
    pub_log_flags(g_test_log, {false, true, false});
    pub_log_flags(g_test_log, {true, true, true, true, true, true, true, true});
    EXPECT_THAT(capture.texts(), testing::ElementsAre("1", "0, 1, 0", "1, 1, 1, 1, 1, 1, 1, 1"));
}

TEST(log, flags_line_holds_eleven)
{
    const log_capture_c capture;
    pub_log_flags(g_test_log, {true, true, true, true, true, true, true, true, true, true, false});
    pub_log_flags(g_test_log, {true, true, true, true, true, true, true, true, true, true, false, true});
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre("1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 0", "1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 0"));
}

TEST(log, dump_shows_up_to_250_bytes)
{
    EXPECT_EQ(dump_text(0), "title: (data_len = 0) -- ");
    EXPECT_EQ(dump_text(3), "title: (data_len = 3) -- 000102");
    const std::string whole = dump_text(250);
    EXPECT_EQ(whole.size(), std::string("title: (data_len = 250) -- ").size() + 500);
    EXPECT_EQ(whole.substr(whole.size() - 4), "F8F9");
}

TEST(log, dump_is_cut_after_250_bytes)
{
    const std::string whole = dump_text(250);
    const std::string cut = dump_text(251);
    EXPECT_EQ(cut, "title: (data_len = 251) -- " + whole.substr(whole.size() - 500) + "...");
    const std::string title = "title: (data_len = 4096) -- ";
    EXPECT_EQ(dump_text(4096), title + whole.substr(whole.size() - 500) + "...");
}

TEST(log, errno_survives_every_operation)
{
    const log_capture_c capture;
    const uint8_t data_a[] = {1};
    errno = EXDEV;
    PUB_LOG(g_test_log, "text");
    EXPECT_EQ(errno, EXDEV);
    pub_log_entry(g_test_log);
    EXPECT_EQ(errno, EXDEV);
    pub_log_flags(g_test_log, {true, false});
    EXPECT_EQ(errno, EXDEV);
    pub_log_dump(g_test_log, "title", data_a, sizeof(data_a));
    EXPECT_EQ(errno, EXDEV);
    pub_log_sys_call(g_test_log, "read");
    EXPECT_EQ(errno, EXDEV);
    pub_log_error(g_test_log, -1);
    EXPECT_EQ(errno, EXDEV);
    EXPECT_THAT(capture.texts()[4], testing::EndsWith("errno = 18"));
    EXPECT_THAT(capture.texts()[5], testing::EndsWith("errno=18"));
}

/* The capture's lock stands for the platform's: a handler that met it on its own thread would wait for ever.
 */
TEST(log, handler_may_log_in_the_middle_of_a_record)
{
    struct sigaction action = {};
    action.sa_handler = log_on_alarm;
    action.sa_flags = SA_RESTART;
    ASSERT_EQ(sigaction(SIGALRM, &action, nullptr), 0);
    itimerval timer = {};
    timer.it_value.tv_usec = 20;
    timer.it_interval.tv_usec = 20;
    ASSERT_EQ(setitimer(ITIMER_REAL, &timer, nullptr), 0);
    for (int i = 0; i < 10000 || g_alarm_count == 0; i++) {
        PUB_LOG(g_test_log, "%d", i);
    }
    timer = {};
    ASSERT_EQ(setitimer(ITIMER_REAL, &timer, nullptr), 0);
    EXPECT_GT(g_alarm_count, 0);
}
