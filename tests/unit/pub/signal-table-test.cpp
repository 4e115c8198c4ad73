#include "pub/util/signal-table.h"

#include <signal.h>
#include <string>

#include <gtest/gtest.h>

#include "pub/util/util.h"
#include "tests/unit/support/log-capture.h"

namespace {

constexpr char ROWS[] = "1 SIGHUP T Hangup (POSIX).\n"
                        "2 SIGINT T Terminal interrupt signal (ANSI).\n"
                        "3 SIGQUIT A Terminal quit signal (POSIX).\n"
                        "4 SIGILL A Illegal instruction (ANSI).\n"
                        "5 SIGTRAP A Trace/breakpoint trap (POSIX).\n"
                        "6 SIGABRT A Process abort signal (ANSI).\n"
                        "6 SIGIOT A IOT trap (4.2 BSD).\n"
                        "7 SIGBUS A Access to an undefined portion of a memory object (4.2 BSD).\n"
                        "8 SIGFPE A Erroneous arithmetic operation (ANSI).\n"
                        "9 SIGKILL T Kill (cannot be caught or ignored) (POSIX).\n"
                        "10 SIGUSR1 T User-defined signal 1 (POSIX).\n"
                        "11 SIGSEGV A Invalid memory reference (ANSI).\n"
                        "12 SIGUSR2 T User-defined signal 2 (POSIX).\n"
                        "13 SIGPIPE T Write on a pipe with no one to read it (POSIX).\n"
                        "14 SIGALRM T Alarm clock (POSIX).\n"
                        "15 SIGTERM T Termination signal (ANSI).\n"
                        "16 SIGSTKFLT ? Stack fault\n"
                        "17 SIGCHLD I Child process terminated, stopped (POSIX).\n"
                        "18 SIGCONT C Continue executing, if stopped (POSIX).\n"
                        "19 SIGSTOP S Stop executing (cannot be caught or ignored) (POSIX).\n"
                        "20 SIGTSTP S Terminal stop signal (POSIX).\n"
                        "21 SIGTTIN S Background process attempting read (POSIX).\n"
                        "22 SIGTTOU S Background process attempting write (POSIX).\n"
                        "23 SIGURG I High bandwidth data is available at a socket (4.2 BSD).\n"
                        "24 SIGXCPU A CPU time limit exceeded (4.2 BSD).\n"
                        "25 SIGXFSZ A File size limit exceeded (4.2 BSD).\n"
                        "26 SIGVTALRM T Virtual timer expired (4.2 BSD).\n"
                        "27 SIGPROF T Profiling timer expired (4.2 BSD).\n"
                        "28 SIGWINCH ? Window size change (4.3 BSD, Sun).\n"
                        "29 SIGPOLL T Pollable event (System V).\n"
                        "29 SIGIO T I/O now possible (4.2 BSD).\n"
                        "30 SIGPWR ? Power failure restart (System V).\n"
                        "31 SIGSYS A Bad system call.\n";

} // namespace

TEST(signal_table, rows_in_order_and_an_end)
{
    std::string rows;
    const pub_util_signal_st *row = pub_util_signal_table;
    for (; row->m_name_ptr != nullptr; row++) {
        rows += std::to_string(row->m_number) + " " + row->m_name_ptr + " " + row->m_action + " " +
                row->m_description_ptr + "\n";
    }
    EXPECT_EQ(rows, ROWS);
    EXPECT_EQ(row->m_number, 0xFFFF);
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
