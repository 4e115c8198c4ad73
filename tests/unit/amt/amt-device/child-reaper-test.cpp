#include "amt/amt-device/child-reaper.h"

#include <errno.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <pthread.h>
#include <signal.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/unit/amt/thread-creation.h"
#include "tests/unit/support/log-capture.h"

namespace {

constexpr char NO_THREAD_LINE[] = "sys call: pthread_create() failed! errno = 11";
constexpr int DEADLINE_MS = 30000;

/* Waits until the condition holds; false when it does not before the deadline. */
template <typename condition_func> bool wait_until(condition_func condition)
{
    constexpr timespec PAUSE = {0, 5 * 1000000};
    for (int waited = 0; waited < DEADLINE_MS; waited += 5) {
        if (condition()) {
            return true;
        }
        nanosleep(&PAUSE, nullptr);
    }
    return condition();
}

/* A process that has ended keeps its id until it is waited for. */
bool is_waited_for(pid_t pid)
{
    return wait_until([pid] { return kill(pid, 0) != 0 && errno == ESRCH; });
}

bool is_zombie(pid_t pid)
{
    siginfo_t info = {};
    return waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOWAIT) == 0 && info.si_pid == pid;
}

/* A child that stays until it gets a signal. */
pid_t start_hanging_child()
{
    const pid_t pid = fork();
    if (pid == 0) {
        for (;;) {
            pause();
        }
    }
    return pid;
}

std::string signal_line(pid_t pid, const std::string &signal)
{
    return "BT-start error. child " + std::to_string(pid) + " ended by signal " + signal;
}

TEST(child_reaper, tells_the_signal_that_ended_a_child)
{
    for (const auto &[number, text] : {std::pair(SIGKILL, "9(SIGKILL)"), std::pair(SIGUSR2, "12(SIGUSR2)")}) {
        const log_capture_c capture;
        const pid_t pid = start_hanging_child();
        amt_child_reap(pid);
        ASSERT_EQ(kill(pid, number), 0);
        EXPECT_TRUE(is_waited_for(pid));
        const std::string line = signal_line(pid, text);
        EXPECT_TRUE(wait_until([&] { return capture.has(line); })) << line;
        EXPECT_EQ(capture.texts().size(), 1U);
    }
}

/* The signals that the threads of this process have blocked, as bits, by thread. */
std::map<std::string, uint64_t> blocked_signals()
{
    constexpr char NAME[] = "SigBlk:";
    std::map<std::string, uint64_t> masks;
    for (const auto &task : std::filesystem::directory_iterator("/proc/self/task")) {
        std::ifstream status(task.path() / "status");
        for (std::string line; std::getline(status, line);) {
            if (line.rfind(NAME, 0) == 0) {
                masks[task.path().filename()] = std::stoull(line.substr(sizeof(NAME) - 1), nullptr, 16);
            }
        }
    }
    return masks;
}

constexpr uint64_t get_bit(int signal_number)
{
    return uint64_t{1} << (signal_number - 1);
}

/* Signals are for those who serve lines: who waits for a child takes none. */
TEST(child_reaper, waits_where_no_signal_comes)
{
    constexpr uint64_t WANTED = get_bit(SIGHUP) | get_bit(SIGINT) | get_bit(SIGUSR1) | get_bit(SIGUSR2) |
                                get_bit(SIGALRM) | get_bit(SIGTERM) | get_bit(SIGCHLD);
    const auto before = blocked_signals();
    const pid_t pid = start_hanging_child();
    amt_child_reap(pid);
    usleep(20000); /* while a thread is made, it takes no signals anyway */
    int deaf_count = 0;
    for (const auto &[task, mask] : blocked_signals()) {
        deaf_count += before.count(task) == 0 && (mask & WANTED) == WANTED ? 1 : 0;
    }
    EXPECT_GE(deaf_count, 1); /* a sanitizer may have made a thread of its own */
    ASSERT_EQ(kill(pid, SIGKILL), 0);
    EXPECT_TRUE(is_waited_for(pid));
}

TEST(child_reaper, says_nothing_of_a_child_that_ends_by_itself)
{
    const log_capture_c capture;
    const pid_t pid = fork();
    if (pid == 0) {
        _exit(9);
    }
    const no_threads_c no_threads;
    amt_child_reap(pid);
    ASSERT_TRUE(is_zombie(pid));
    const pid_t other_pid = start_hanging_child();
    amt_child_reap(other_pid);
    EXPECT_TRUE(is_waited_for(pid));
    EXPECT_THAT(capture.texts(), testing::ElementsAre(NO_THREAD_LINE, NO_THREAD_LINE));
    kill(other_pid, SIGKILL);
    EXPECT_EQ(waitpid(other_pid, nullptr, 0), other_pid);
}

/* A chip that hangs keeps its child: the caller has lines to serve meanwhile. */
TEST(child_reaper, never_waits_itself)
{
    pid_t hanging_pid = 0;
    {
        const log_capture_c capture;
        const no_threads_c no_threads;
        hanging_pid = start_hanging_child();
        amt_child_reap(hanging_pid);
        EXPECT_EQ(kill(hanging_pid, 0), 0);
        EXPECT_THAT(capture.texts(), testing::ElementsAre(NO_THREAD_LINE));
    }
    const log_capture_c capture;
    const pid_t second_pid = start_hanging_child();
    errno = EINTR; /* of another call: what did not fail says nothing by it */
    amt_child_reap(second_pid);
    EXPECT_EQ(kill(hanging_pid, 0), 0) << "it still hangs, and nobody waits";
    ASSERT_EQ(kill(hanging_pid, SIGKILL), 0);
    ASSERT_TRUE(is_zombie(hanging_pid));
    const pid_t third_pid = start_hanging_child();
    amt_child_reap(third_pid);
    EXPECT_TRUE(is_waited_for(hanging_pid)) << "the next start asks for it";
    EXPECT_TRUE(capture.has(signal_line(hanging_pid, "9(SIGKILL)")));
    for (const pid_t pid : {second_pid, third_pid}) {
        ASSERT_EQ(kill(pid, SIGKILL), 0);
        EXPECT_TRUE(is_waited_for(pid));
    }
}

/* What another part of the process has started keeps its status for that part. */
TEST(child_reaper, leaves_other_children_alone)
{
    const pid_t other_pid = fork();
    if (other_pid == 0) {
        _exit(3);
    }
    ASSERT_TRUE(is_zombie(other_pid));
    const pid_t pid = start_hanging_child();
    amt_child_reap(pid);
    int status = 0;
    EXPECT_EQ(waitpid(other_pid, &status, WNOHANG), other_pid);
    EXPECT_EQ(WEXITSTATUS(status), 3);
    ASSERT_EQ(kill(pid, SIGKILL), 0);
    EXPECT_TRUE(is_waited_for(pid));
}

TEST(child_reaper, a_child_does_not_outlive_its_parent)
{
    EXPECT_EXIT(amt_child_die_with(getpid()), testing::ExitedWithCode(0), "");
    const auto stay = [] {
        amt_child_die_with(getppid());
        _exit(7);
    };
    EXPECT_EXIT(stay(), testing::ExitedWithCode(7), "");
}

TEST(child_reaper, tells_of_a_child_too_many)
{
    constexpr int COUNT = 17;
    std::vector<pid_t> pids;
    {
        const log_capture_c capture;
        const no_threads_c no_threads;
        for (int i = 0; i < COUNT; i++) {
            pids.push_back(start_hanging_child());
            amt_child_reap(pids.back());
        }
        EXPECT_EQ(capture.count_containing("nobody waits for child "), 1);
        EXPECT_TRUE(capture.has("nobody waits for child " + std::to_string(pids.back())));
    }
    for (const pid_t pid : pids) {
        kill(pid, SIGKILL);
        ASSERT_TRUE(is_zombie(pid));
    }
    const pid_t last_pid = start_hanging_child();
    amt_child_reap(last_pid);
    kill(last_pid, SIGKILL);
    EXPECT_EQ(waitpid(pids.back(), nullptr, WNOHANG), pids.back());
    for (const pid_t pid : pids) {
        EXPECT_TRUE(is_waited_for(pid));
    }
    EXPECT_TRUE(is_waited_for(last_pid));
}

} // namespace
