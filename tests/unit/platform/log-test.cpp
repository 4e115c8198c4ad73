#include <algorithm>
#include <atomic>
#include <errno.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <limits>
#include <map>
#include <pthread.h>
#include <regex>
#include <signal.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <thread>
#include <time.h>
#include <unistd.h>

#include "platform/host/log/calendar.h"
#include "platform/include/android/log.h"
#include "tests/unit/platform/support.h"

/* The library opens its log once in a process, so every test logs from child processes. */
class log_test : public stand_in_test {
protected:
    std::vector<std::string> log_lines() const
    {
        return lines("log.txt");
    }

    /* The record's line without its time. */
    static std::string body(const std::string &line)
    {
        static const std::regex head("\\d\\d-\\d\\d \\d\\d:\\d\\d:\\d\\d\\.\\d{3} (.*)");
        std::smatch match;
        return std::regex_match(line, match, head) ? match[1].str() : "no time: " + line;
    }

    static std::string ids()
    {
        return std::to_string(getpid()) + " " + std::to_string(gettid());
    }
};

TEST_F(log_test, one_line_with_time_ids_priority_and_tag)
{
    const pid_t pid = fork();
    if (pid == 0) {
        __android_log_print(ANDROID_LOG_DEBUG, "vx-kel-amt", "value %d of %s", 7, "atom");
        _exit(0);
    }
    waitpid(pid, nullptr, 0);
    const std::string id = std::to_string(pid);
    ASSERT_EQ(log_lines().size(), 1u);
    EXPECT_EQ(body(log_lines()[0]), id + " " + id + " D vx-kel-amt: value 7 of atom");
    EXPECT_EQ(read("log.txt").back(), '\n');
}

TEST_F(log_test, time_is_the_present_in_utc)
{
    char before_a[32];
    char after_a[32];
    time_t now = time(nullptr);
    strftime(before_a, sizeof(before_a), "%m-%d %H:%M:%S.000", gmtime(&now));
    in_child([] { __android_log_print(ANDROID_LOG_DEBUG, "t", "x"); });
    now = time(nullptr) + 1;
    strftime(after_a, sizeof(after_a), "%m-%d %H:%M:%S.000", gmtime(&now));
    ASSERT_EQ(log_lines().size(), 1u);
    const std::string shown = log_lines()[0].substr(0, 18);
    if (std::string(before_a) < after_a) { /* not across the end of a year */
        EXPECT_GE(shown, before_a);
        EXPECT_LT(shown, after_a);
    }
}

TEST_F(log_test, every_day_of_the_calendar_is_right)
{
    const int64_t last_day = std::min<int64_t>(366 * 200, std::numeric_limits<time_t>::max() / 86400);
    for (int64_t days = 0; days < last_day; days++) {
        const time_t seconds = static_cast<time_t>(days * 86400);
        struct tm expected;
        gmtime_r(&seconds, &expected);
        uint32_t month = 0;
        uint32_t day = 0;
        log_month_and_day(days, &month, &day);
        ASSERT_EQ(month, static_cast<uint32_t>(expected.tm_mon + 1)) << days;
        ASSERT_EQ(day, static_cast<uint32_t>(expected.tm_mday)) << days;
    }
}

TEST_F(log_test, null_tag_is_legal)
{
    in_child([] { __android_log_print(ANDROID_LOG_DEBUG, nullptr, "fb open failed!\n"); });
    ASSERT_EQ(log_lines().size(), 1u);
    EXPECT_THAT(log_lines()[0], testing::EndsWith(" D (null): fb open failed!\\n"));
}

TEST_F(log_test, line_breaks_are_shown_as_escapes)
{
    in_child([] { __android_log_print(ANDROID_LOG_DEBUG, "t", "\r\n^DMCC: 1\r\n\r\nOK\r\n"); });
    ASSERT_EQ(log_lines().size(), 1u);
    EXPECT_THAT(log_lines()[0], testing::EndsWith("D t: \\r\\n^DMCC: 1\\r\\n\\r\\nOK\\r\\n"));
}

TEST_F(log_test, priorities_have_their_letters)
{
    in_child([] {
        for (int priority = -1; priority <= 9; priority++) {
            __android_log_print(priority, "t", "x");
        }
    });
    std::string letters;
    for (const std::string &line : log_lines()) {
        letters += line[line.size() - 6];
    }
    EXPECT_EQ(letters, "???VDIWEFS?");
}

TEST_F(log_test, the_longest_text_of_the_daemon_is_whole)
{
    in_child(
        [] { __android_log_print(ANDROID_LOG_DEBUG, "vx-kel-amt", "%s", std::string(4607, '\n').c_str()); });
    ASSERT_EQ(log_lines().size(), 1u);
    const std::string line = log_lines()[0];
    const size_t start = line.find(": ") + 2;
    ASSERT_EQ(line.size() - start, 2u * 4607u);
    for (size_t i = start; i < line.size(); i += 2) {
        ASSERT_EQ(line.substr(i, 2), "\\n");
    }
}

TEST_F(log_test, a_text_beyond_the_record_is_cut_and_stays_one_line)
{
    in_child([] {
        __android_log_print(ANDROID_LOG_DEBUG, "t", "%s", std::string(50000, 'a').c_str());
        __android_log_print(ANDROID_LOG_DEBUG, "t", "%s", std::string(50000, '\n').c_str());
        __android_log_print(ANDROID_LOG_DEBUG, std::string(500, 'T').c_str(), "x");
    });
    ASSERT_EQ(log_lines().size(), 3u);
    EXPECT_THAT(log_lines()[0], testing::HasSubstr("D t: aaaa"));
    EXPECT_GT(log_lines()[0].size(), 9000u);
    EXPECT_LT(log_lines()[0].size(), 11000u);
    EXPECT_THAT(log_lines()[2], testing::EndsWith("TTTT: x"));
}

TEST_F(log_test, errno_is_kept_and_can_be_shown)
{
    const int status = in_child([] {
        errno = ENODEV;
        __android_log_print(ANDROID_LOG_DEBUG, "t", "%m");
        EXPECT_EQ(errno, ENODEV);
    });
    EXPECT_EQ(status, 0);
    EXPECT_THAT(log_lines()[0], testing::EndsWith(": No such device"));
}

TEST_F(log_test, without_a_file_it_goes_to_standard_error)
{
    for (const std::string &file : {std::string(), path("missing/log.txt")}) {
        setenv("VX_HOST_LOG", file.c_str(), 1);
        const std::string error_file = path("stderr.txt");
        in_child([&] {
            dup2(open(error_file.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600), STDERR_FILENO);
            __android_log_print(ANDROID_LOG_DEBUG, "t", "hello");
        });
        ASSERT_EQ(lines("stderr.txt").size(), 1u) << file;
        EXPECT_THAT(lines("stderr.txt")[0], testing::EndsWith("D t: hello"));
    }
}

TEST_F(log_test, standard_descriptors_stay_free_for_their_owner)
{
    const int status = in_child([] {
        close(STDIN_FILENO);
        __android_log_print(ANDROID_LOG_DEBUG, "t", "hello");
        EXPECT_EQ(fcntl(STDIN_FILENO, F_GETFD), -1);
    });
    EXPECT_EQ(status, 0);
    EXPECT_EQ(log_lines().size(), 1u);
}

TEST_F(log_test, ids_are_right_after_fork_and_on_threads)
{
    const std::string expected_file = path("expected.txt");
    in_child([&] {
        FILE *expected = fopen(expected_file.c_str(), "w");
        const auto log_ids = [&] {
            __android_log_print(ANDROID_LOG_DEBUG, "t", "x");
            fprintf(expected, "%s D t: x\n", ids().c_str());
            fflush(expected);
        };
        log_ids();
        std::thread([&] {
            log_ids();
            in_child(log_ids); /* forked on a thread that has logged before */
            log_ids();
        }).join();
        log_ids();
    });
    std::vector<std::string> bodies;
    for (const std::string &line : log_lines()) {
        bodies.push_back(body(line));
    }
    ASSERT_EQ(bodies.size(), 5u);
    EXPECT_EQ(bodies, lines("expected.txt"));
}

TEST_F(log_test, processes_and_threads_keep_their_lines_whole)
{
    constexpr int processes = 3;
    constexpr int threads = 3;
    constexpr int records = 300;
    std::vector<pid_t> children;
    for (int i = 0; i < processes; i++) {
        const pid_t pid = fork();
        if (pid == 0) {
            std::vector<std::thread> workers;
            workers.reserve(threads);
            for (int j = 0; j < threads; j++) {
                workers.emplace_back([i, j] {
                    const std::string text(600, static_cast<char>('a' + i * threads + j));
                    for (int record = 0; record < records; record++) {
                        __android_log_print(ANDROID_LOG_DEBUG, "t", "%d %s", record, text.c_str());
                    }
                });
            }
            for (std::thread &worker : workers) {
                worker.join();
            }
            _exit(0);
        }
        children.push_back(pid);
    }
    for (const pid_t pid : children) {
        waitpid(pid, nullptr, 0);
    }
    const std::regex whole("[-0-9]+ [:.0-9]+ \\d+ \\d+ D t: (\\d+) (.)\\2{599}");
    std::map<std::string, int> next_record;
    for (const std::string &line : log_lines()) {
        std::smatch match;
        ASSERT_TRUE(std::regex_match(line, match, whole)) << line;
        EXPECT_EQ(std::stoi(match[1]), next_record[match[2]]++);
    }
    ASSERT_EQ(next_record.size(), static_cast<size_t>(processes * threads));
    for (const auto &worker : next_record) {
        EXPECT_EQ(worker.second, records);
    }
}

namespace {

volatile sig_atomic_t g_interrupts = 0;

void log_from_handler(int)
{
    g_interrupts = g_interrupts + 1;
    __android_log_print(ANDROID_LOG_DEBUG, "handler", "%s()", "signal_treatment");
}

} // namespace

TEST_F(log_test, a_handler_may_log_in_the_middle_of_a_record)
{
    const int status = in_child([] {
        signal(SIGALRM, log_from_handler);
        const struct itimerval every = {{0, 200}, {0, 200}};
        setitimer(ITIMER_REAL, &every, nullptr);
        while (g_interrupts < 300) {
            __android_log_print(ANDROID_LOG_DEBUG, "main", "%s", "text");
        }
        const struct itimerval never = {};
        setitimer(ITIMER_REAL, &never, nullptr);
    });
    EXPECT_EQ(status, 0);
    int handled = 0;
    for (const std::string &line : log_lines()) {
        const std::string text = line.substr(line.find(" D ") + 3);
        ASSERT_TRUE(text == "main: text" || text == "handler: signal_treatment()") << line;
        handled += text[0] == 'h';
    }
    EXPECT_GE(handled, 300);
}

#if !defined(__SANITIZE_THREAD__) /* its runtime hands a signal on only at system calls of its own */
namespace {

/* Without destructors or noexcept frames, like the code of the daemon: nothing stops the unwinding. */
void *log_for_ever(void *)
{
    for (;;) {
        __android_log_print(ANDROID_LOG_DEBUG, "worker", "%0300d", 7);
    }
}

void end_thread(int)
{
    pthread_exit(nullptr);
}

} // namespace

TEST_F(log_test, a_thread_may_be_ended_in_the_middle_of_a_record)
{
    const int status = in_child([] {
        signal(SIGUSR1, end_thread);
        for (int i = 0; i < 50; i++) {
            pthread_t thread;
            pthread_create(&thread, nullptr, log_for_ever, nullptr);
            usleep(static_cast<useconds_t>(100 + 37 * i));
            pthread_kill(thread, SIGUSR1);
            pthread_join(thread, nullptr);
            __android_log_print(ANDROID_LOG_DEBUG, "main", "after thread %d", i);
        }
    });
    EXPECT_EQ(status, 0);
    int after = 0;
    for (const std::string &line : log_lines()) {
        after += line.find(" D main: after thread ") != std::string::npos;
    }
    EXPECT_EQ(after, 50);
}
#endif
