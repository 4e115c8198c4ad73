#include "amt/amt-device/device-request.h"

#include <errno.h>
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/amt/amt-device/radio-library.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

/*
 * The handler returns twice, in the service and in its child. The child of a test writes what it has got into
 * a pipe and ends there.
 */
namespace {

using testing::ElementsAre;

constexpr int DEADLINE_MS = 10000;

void pause_ms(long ms)
{
    const timespec time = {ms / 1000, ms % 1000 * 1000000L};
    nanosleep(&time, nullptr);
}

struct pipe_st
{
    int m_fd_a[2] = {-1, -1};

    pipe_st()
    {
        EXPECT_EQ(pipe(m_fd_a), 0);
    }

    ~pipe_st()
    {
        close(m_fd_a[0]);
        close_write();
    }

    void close_write()
    {
        if (m_fd_a[1] >= 0) {
            close(m_fd_a[1]);
        }
        m_fd_a[1] = -1;
    }

    template <typename value_t> void put(const value_t &value) const
    {
        EXPECT_EQ(write(m_fd_a[1], &value, sizeof(value)), static_cast<ssize_t>(sizeof(value)));
    }

    /* Whether a value came before the deadline; not when all writers are gone. */
    template <typename value_t> bool get(value_t *value_ptr) const
    {
        pollfd wait = {m_fd_a[0], POLLIN, 0};
        return poll(&wait, 1, DEADLINE_MS) == 1 &&
               read(m_fd_a[0], value_ptr, sizeof(*value_ptr)) == static_cast<ssize_t>(sizeof(*value_ptr));
    }

    /* Whether all writers are gone before the deadline. */
    bool is_at_end() const
    {
        char byte = 0;
        pollfd wait = {m_fd_a[0], POLLIN, 0};
        return poll(&wait, 1, DEADLINE_MS) == 1 && read(m_fd_a[0], &byte, 1) == 0;
    }
};

struct child_report_st
{
    pid_t m_pid;
    int m_result;
};

/* Calls the handler; the child reports its result and ends. Returns the service's result. */
int start_bluetooth(const modem_line_c &line, const pipe_st &report)
{
    const pid_t service_pid = getpid();
    const int result = line.handle(amt_device_bt, wire_packet(170, ""));
    if (getpid() != service_pid) {
        report.put(child_report_st{getpid(), result});
        _exit(0);
    }
    return result;
}

/* A process that has ended keeps its id until it is waited for. */
bool is_waited_for(pid_t pid)
{
    for (int waited = 0; waited < DEADLINE_MS; waited += 10) {
        if (kill(pid, 0) != 0 && errno == ESRCH) {
            return true;
        }
        pause_ms(10);
    }
    return false;
}

TEST(bluetooth, service_and_child_both_acknowledge_and_return)
{
    const pipe_st report;
    const radio_library_c library;
    const modem_line_c line;
    EXPECT_EQ(start_bluetooth(line, report), PUB_ERR_NONE);
    child_report_st child = {};
    ASSERT_TRUE(report.get(&child));
    EXPECT_EQ(child.m_result, PUB_ERR_NONE);
    EXPECT_NE(child.m_pid, getpid());
    const std::string ok = wire_packet(171, int_atom(1, 0));
    EXPECT_THAT(line.app_packets(), ElementsAre(ok, ok));
    EXPECT_TRUE(library.m_calls.empty()) << "the service itself must not wait for the chip";
    EXPECT_TRUE(is_waited_for(child.m_pid));
}

TEST(bluetooth, the_service_acknowledges_before_the_chip_is_on)
{
    const pipe_st report;
    const pipe_st gate;
    radio_library_c library;
    library.m_in_call = [&gate] {
        char byte = 0;
        gate.get(&byte);
    };
    const modem_line_c line;
    EXPECT_EQ(start_bluetooth(line, report), PUB_ERR_NONE);
    const std::string ok = wire_packet(171, int_atom(1, 0));
    EXPECT_THAT(line.app_packets(), ElementsAre(ok));
    gate.put('g');
    child_report_st child = {};
    ASSERT_TRUE(report.get(&child));
    EXPECT_THAT(line.app_packets(), ElementsAre(ok));
    EXPECT_TRUE(is_waited_for(child.m_pid));
}

/* The child's log is its own; it is checked there and its verdict reported. */
TEST(bluetooth, a_failed_child_returns_the_failure)
{
    const pipe_st report;
    radio_library_c library;
    library.m_answer = 6;
    const modem_line_c line;
    const pid_t service_pid = getpid();
    const log_capture_c capture;
    errno = 0;
    const int result = line.handle(amt_device_bt, wire_packet(170, ""));
    if (getpid() != service_pid) {
        const std::vector<std::string> expected = {
            "amt_device_bt()",
            "BT-start start",
            "BT-start end. return:6.",
            error_line("amt/amt-device", "amt_device_bt", PUB_ERR_FAIL),
            "BT-start error. call ldt_btCtrl fail: 6",
            error_line("amt/amt-device", "amt_device_bt", PUB_ERR_FILE),
            "error to exec: hciattach",
        };
        const bool is_expected = without_line_numbers(capture) == expected &&
                                 library.m_calls == std::vector<std::string>{"ldt_btCtrl(1)"};
        report.put(child_report_st{getpid(), is_expected ? result : 1});
        _exit(0);
    }
    EXPECT_EQ(result, PUB_ERR_NONE);
    child_report_st child = {};
    ASSERT_TRUE(report.get(&child));
    EXPECT_EQ(child.m_result, PUB_ERR_FILE) << "1: the child's lines or calls were others";
    EXPECT_THAT(line.app_packets(), ElementsAre(wire_packet(171, int_atom(1, 0))));
    EXPECT_TRUE(is_waited_for(child.m_pid));
}

TEST(bluetooth, repeated_starts_leave_no_children)
{
    const pipe_st report;
    const radio_library_c library;
    const modem_line_c line;
    std::vector<pid_t> pids;
    for (int i = 0; i < 50; i++) {
        ASSERT_EQ(start_bluetooth(line, report), PUB_ERR_NONE);
        child_report_st child = {};
        ASSERT_TRUE(report.get(&child));
        pids.push_back(child.m_pid);
    }
    for (const pid_t pid : pids) {
        EXPECT_TRUE(is_waited_for(pid));
    }
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    EXPECT_EQ(errno, ECHILD);
}

/* A child of the test plays the service and is killed while its own child waits for the chip. */
TEST(bluetooth, the_child_does_not_outlive_the_service)
{
    pipe_st alive;
    radio_library_c library;
    library.m_in_call = [&alive] {
        alive.put(getpid());
        pause_ms(60000);
    };
    const pid_t service_pid = fork();
    ASSERT_GE(service_pid, 0);
    if (service_pid == 0) {
        const modem_line_c line;
        line.handle(amt_device_bt, wire_packet(170, ""));
        pause_ms(60000);
        _exit(0);
    }
    alive.close_write();
    pid_t child_pid = 0;
    ASSERT_TRUE(alive.get(&child_pid));
    EXPECT_EQ(kill(child_pid, 0), 0);
    EXPECT_EQ(kill(service_pid, SIGKILL), 0);
    EXPECT_EQ(waitpid(service_pid, nullptr, 0), service_pid);
    EXPECT_TRUE(alive.is_at_end()) << "the child still holds the pipe";
}

/* system() waits for its own child only and finds it, whatever the reaper does at the same time. */
TEST(bluetooth, the_shell_works_beside_the_reaper)
{
    const pipe_st report;
    const radio_library_c library;
    const modem_line_c line;
    for (int i = 0; i < 20; i++) {
        ASSERT_EQ(start_bluetooth(line, report), PUB_ERR_NONE);
        EXPECT_EQ(WEXITSTATUS(system("exit 7")), 7);
        child_report_st child = {};
        ASSERT_TRUE(report.get(&child));
    }
}

} // namespace
