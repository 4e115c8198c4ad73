#include "amt/amt-handle/channel/at-io.h"

#include <atomic>
#include <chrono>
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <thread>
#include <time.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/amt/modem-pty.h"
#include "tests/unit/amt/small-file.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

constexpr char SILENCE[] = "AT^DLKS=0\r";

std::string fail_line(int code, int error_number = 0)
{
    return error_line("amt/amt-handle", "disable_unsolicited_code", code, error_number);
}

/* What the silencing of a modem that answers with these chunks gives. */
int silence(const texts_t &chunk_list)
{
    const modem_line_c line;
    for (const std::string &chunk : chunk_list) {
        line.answer(chunk);
    }
    const int status = disable_unsolicited_code(g_handle_context.m_fd_at);
    EXPECT_EQ(line.commands(), texts_t{SILENCE});
    EXPECT_EQ(line.unread_chunks(), 0U);
    return status;
}

TEST(at_silence, ends_with_a_final_result)
{
    EXPECT_EQ(silence({"\r\nOK\r\n"}), PUB_ERR_NONE);
    EXPECT_EQ(silence({"AT^DLKS=0\r", "\r\nOK\r\n"}), PUB_ERR_NONE);
    EXPECT_EQ(silence({"noise\r\nOK\r\n"}), PUB_ERR_NONE);
    EXPECT_EQ(silence({"\r\nERROR\r\n"}), PUB_ERR_FAIL);
    EXPECT_EQ(silence({"\r\n+CME ERROR: "}), PUB_ERR_FAIL);
    EXPECT_EQ(silence({"\r\n+CMS ERROR: 3\r\n"}), PUB_ERR_FAIL);
    /* Within one piece the good result is looked for first. */
    EXPECT_EQ(silence({"\r\nERROR\r\n\r\nOK\r\n"}), PUB_ERR_NONE);
}

TEST(at_silence, sees_no_result_across_pieces)
{
    EXPECT_EQ(silence({"\r\nO", "K\r\n", "OK\r\n", "\r\nOK", "\r\nERR", "OR\r\n",
                       "\r\n+CME ERROR:", "\r\nERROR\r\n"}),
              PUB_ERR_FAIL);
    const log_capture_c capture;
    EXPECT_EQ(silence({"\r\nOK", "\r\n", "", "\r\nOK\r\n"}), PUB_ERR_NONE);
    EXPECT_EQ(capture.texts(), texts_t{});
}

TEST(at_silence, logs_a_refusal)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(silence({"\r\nERROR\r\n"}), PUB_ERR_FAIL);
    ASSERT_EQ(capture.texts().size(), 1U);
    EXPECT_EQ(capture.count_containing("FUNC-disable_unsolicited_code(), error_code=-100"), 1);
}

TEST(at_silence, needs_a_descriptor)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(disable_unsolicited_code(0), PUB_ERR_PARAM);
    EXPECT_EQ(disable_unsolicited_code(-1), PUB_ERR_PARAM);
    EXPECT_EQ(without_line_numbers(capture), texts_t(2, fail_line(-101)));
}

TEST(at_silence, fails_when_the_tty_cannot_be_waited_for)
{
    const log_capture_c capture;
    EXPECT_EQ(disable_unsolicited_code(1000000), PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"sys call: select() failed! errno = 9", fail_line(-118, EBADF)}));
}

TEST(at_silence, fails_when_the_tty_cannot_be_written)
{
    const int fd = open("/dev/null", O_RDONLY | O_CLOEXEC);
    const log_capture_c capture;
    EXPECT_EQ(disable_unsolicited_code(fd), PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"sys call: write() failed! errno = 9", fail_line(-118, EBADF)}));
    close(fd);
}

TEST(at_silence, fails_after_a_short_write)
{
    const small_file_c file(4);
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(disable_unsolicited_code(file.fd()), PUB_ERR_INCOMPLETE);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"WARNING !", "write not completed: to write(10) != written(4)", fail_line(-119)}));
}

TEST(at_silence, does_not_wait_for_ever_to_be_heard)
{
    int fd_a[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, fd_a), 0);
    const std::string block(4096, 'x');
    while (write(fd_a[0], block.data(), block.size()) > 0) {
    }
    while (write(fd_a[0], block.data(), 1) > 0) {
    }
    const auto begin = std::chrono::steady_clock::now();
    const log_capture_c capture;
    EXPECT_EQ(disable_unsolicited_code(fd_a[0]), PUB_ERR_TIMEOUT);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(4900));
    EXPECT_EQ(capture.texts().back(), "wait 5 seconds to write time out");
    EXPECT_EQ(capture.count_containing("FUNC-disable_unsolicited_code(), error_code=-113"), 1);
    close(fd_a[0]);
    close(fd_a[1]);
}

TEST(at_silence, covers_a_piece_behind_its_zero_bytes)
{
    EXPECT_EQ(silence({std::string("\0\r\nOK\r\n", 7)}), PUB_ERR_NONE);
    EXPECT_EQ(silence({std::string("\0\0\r\nERROR\r\n", 11)}), PUB_ERR_FAIL);
}

TEST(at_silence, ends_when_the_line_hangs_up)
{
    int fd_a[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fd_a), 0);
    std::thread modem([&] {
        char command_a[sizeof(SILENCE)] = {};
        EXPECT_EQ(read(fd_a[1], command_a, sizeof(command_a)), 10);
        close(fd_a[1]);
    });
    const log_capture_c capture;
    EXPECT_EQ(disable_unsolicited_code(fd_a[0]), PUB_ERR_FILE);
    modem.join();
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"sys call: read() failed! errno = 5", fail_line(-118, EIO)}));
    close(fd_a[0]);
}

TEST(at_silence, a_failing_read_is_no_end)
{
    const modem_line_c line;
    const int fd = open("/dev/null", O_WRONLY | O_CLOEXEC);
    ASSERT_GT(fd, 0);
    std::atomic<int> is_heard{0};
    std::thread repair([&] {
        while (is_heard == 0) {
            usleep(1000);
        }
        usleep(150000);
        line.answer("\r\nOK\r\n");
        dup2(g_handle_context.m_fd_at, fd);
    });
    const log_capture_c capture;
    std::thread watch([&] {
        while (!capture.has("sys call: read() failed! errno = 9")) {
            usleep(1000);
        }
        is_heard = 1;
    });
    /* The result is that of the last read. */
    EXPECT_EQ(disable_unsolicited_code(fd), PUB_ERR_NONE);
    repair.join();
    watch.join();
    EXPECT_GE(capture.count_containing("FUNC-disable_unsolicited_code(), error_code=-118, errno=9"), 1);
    EXPECT_LE(capture.count_containing("sys call: read() failed!"), 10) << "it is not tried again at once";
    close(fd);
}

/* While it lives, the kernel lets nobody wait for a descriptor. */
class no_waits_c {
public:
    no_waits_c()
    {
        EXPECT_EQ(getrlimit(RLIMIT_NOFILE, &m_limit), 0);
        const rlimit none = {0, m_limit.rlim_max};
        EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &none), 0);
    }
    ~no_waits_c()
    {
        EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &m_limit), 0);
    }
    no_waits_c(const no_waits_c &) = delete;
    no_waits_c &operator=(const no_waits_c &) = delete;

private:
    rlimit m_limit = {};
};

constexpr char NO_WAIT_LINE[] = "sys call: select() failed! errno = 22";

TEST(at_silence, a_failing_wait_is_no_end)
{
    const modem_pty_c tty;
    const int fd = open(tty.path().c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    const log_capture_c capture;
    std::thread modem([&] {
        EXPECT_EQ(tty.hear(10), SILENCE);
        {
            const no_waits_c no_waits;
            tty.say("noise");
            while (!capture.has(NO_WAIT_LINE)) {
                usleep(1000);
            }
            usleep(150000);
        }
        tty.say("\r\nOK\r\n");
    });
    EXPECT_EQ(disable_unsolicited_code(fd), PUB_ERR_NONE);
    modem.join();
    EXPECT_GE(capture.count_containing("FUNC-disable_unsolicited_code(), error_code=-118, errno=22"), 1);
    EXPECT_LE(capture.count_containing(NO_WAIT_LINE), 10) << "it is not tried again at once";
    close(fd);
}

std::atomic<bool> g_does_time_stand_still;

/* Whoever sets the clock back while the modem is silent has not made it answer late. */
TEST(at_silence, a_clock_that_is_set_back_tells_no_time_out)
{
    const modem_pty_c tty;
    const int fd = open(tty.path().c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    g_does_time_stand_still = true;
    const auto begin = std::chrono::steady_clock::now();
    std::thread modem([&] {
        EXPECT_EQ(tty.hear(10), SILENCE);
        usleep(5500000);
        tty.say("\r\nOK\r\n");
    });
    const log_capture_c capture;
    EXPECT_EQ(disable_unsolicited_code(fd), PUB_ERR_NONE);
    modem.join();
    g_does_time_stand_still = false;
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(5400));
    EXPECT_EQ(capture.texts(), texts_t{});
    close(fd);
}

} // namespace

extern "C" int clock_gettime(clockid_t clock, timespec *time_ptr) noexcept
{
    if (clock == CLOCK_REALTIME && g_does_time_stand_still) {
        *time_ptr = {1000, 0};
        return 0;
    }
    using clock_func = int (*)(clockid_t, timespec *);
    static const clock_func next = reinterpret_cast<clock_func>(dlsym(RTLD_NEXT, "clock_gettime"));
    return next(clock, time_ptr);
}
