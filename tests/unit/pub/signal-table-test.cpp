#include "pub/util/signal-table.h"

#include <signal.h>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "pub/util/util.h"
#include "tests/unit/support/log-capture.h"

TEST(signal_table, rows_in_order_and_an_end)
{
    const std::vector<std::pair<std::string, char>> expected_list = {
        {"SIGHUP", 'T'},  {"SIGINT", 'T'},    {"SIGQUIT", 'A'}, {"SIGILL", 'A'},   {"SIGTRAP", 'A'},
        {"SIGABRT", 'A'}, {"SIGIOT", 'A'},    {"SIGBUS", 'A'},  {"SIGFPE", 'A'},   {"SIGKILL", 'T'},
        {"SIGUSR1", 'T'}, {"SIGSEGV", 'A'},   {"SIGUSR2", 'T'}, {"SIGPIPE", 'T'},  {"SIGALRM", 'T'},
        {"SIGTERM", 'T'}, {"SIGSTKFLT", '?'}, {"SIGCHLD", 'I'}, {"SIGCONT", 'C'},  {"SIGSTOP", 'S'},
        {"SIGTSTP", 'S'}, {"SIGTTIN", 'S'},   {"SIGTTOU", 'S'}, {"SIGURG", 'I'},   {"SIGXCPU", 'A'},
        {"SIGXFSZ", 'A'}, {"SIGVTALRM", 'T'}, {"SIGPROF", 'T'}, {"SIGWINCH", '?'}, {"SIGPOLL", 'T'},
        {"SIGIO", 'T'},   {"SIGPWR", '?'},    {"SIGSYS", 'A'},
    };
    const pub_util_signal_st *row = pub_util_signal_table;
    for (const auto &[name, action] : expected_list) {
        ASSERT_NE(row->m_name_ptr, nullptr) << name;
        EXPECT_EQ(row->m_name_ptr, name);
        EXPECT_EQ(row->m_action, action) << name;
        EXPECT_STRNE(row->m_description_ptr, "") << name;
        row++;
    }
    EXPECT_EQ(row->m_number, 0xFFFF);
    EXPECT_EQ(row->m_name_ptr, nullptr);
}

TEST(signal_table, numbers_are_the_kernel_s)
{
    EXPECT_STREQ(pub_util_get_signal_name(SIGUSR1), "SIGUSR1");
    EXPECT_STREQ(pub_util_get_signal_name(SIGSEGV), "SIGSEGV");
    EXPECT_STREQ(pub_util_get_signal_name(SIGBUS), "SIGBUS");
    EXPECT_STREQ(pub_util_get_signal_name(SIGSYS), "SIGSYS");
    EXPECT_STREQ(pub_util_get_signal_name(12), "SIGUSR2");
}

TEST(signal_table, every_number_from_1_to_31_has_a_name)
{
    for (int number = 1; number <= 31; number++) {
        EXPECT_STRNE(pub_util_get_signal_name(number), "") << number;
    }
}

TEST(signal_table, first_of_two_names_counts)
{
    EXPECT_STREQ(pub_util_get_signal_name(6), "SIGABRT");
    EXPECT_STREQ(pub_util_get_signal_name(29), "SIGPOLL");
}

TEST(signal_table, unlisted_numbers_have_an_empty_name)
{
    const log_capture_c capture;
    EXPECT_STREQ(pub_util_get_signal_name(40), "");
    EXPECT_STREQ(pub_util_get_signal_name(0), "");
    EXPECT_STREQ(pub_util_get_signal_name(-1), "");
    EXPECT_STREQ(pub_util_get_signal_name(0xFFFF), "");
    EXPECT_TRUE(capture.records().empty());
}
