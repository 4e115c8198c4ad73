#include "amt/amt-handle/channel/at-io.h"

#include <atomic>
#include <chrono>
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/amt/modem-pty.h"
#include "tests/unit/amt/small-file.h"
#include "tests/unit/support/descriptor-swap.h"
#include "tests/unit/support/log-lines.h"
#include "tests/unit/support/temp-folder.h"

namespace {

using texts_t = std::vector<std::string>;

constexpr char SOURCE[] = "amt/amt-handle";
constexpr char SILENCE[] = "AT^DLKS=0\r";

/* The modem's consent in the size of one read, so that nothing of what follows goes with it. */
constexpr char CONSENT[] = "\r\nOK\r\n............";

std::string fail_line(const std::string &func, int code, int error_number = 0)
{
    return error_line(SOURCE, func, code, error_number);
}

bool holds_in_order(const texts_t &text_list, const texts_t &wanted)
{
    size_t place = 0;
    for (const std::string &text : text_list) {
        place += place < wanted.size() && text == wanted[place] ? 1U : 0U;
    }
    return place == wanted.size();
}

/* The AT channel is a tty that has been lost, and a good one stands under its name. */
class lost_channel_c {
public:
    lost_channel_c()
    {
        snprintf(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a), "%s", m_tty.path().c_str());
        g_handle_context.m_fd_at = open_lost_tty();
        g_handle_state.m_is_no_modem = 0;
        alarm(30);
    }
    ~lost_channel_c()
    {
        alarm(0);
        amt_handle_close_fd(&g_handle_context.m_fd_at);
        g_handle_context.m_fd_at = 0;
        memset(g_amt_cfg.m_tty_at_mux_a, 0, sizeof(g_amt_cfg.m_tty_at_mux_a));
        g_handle_state.m_is_no_modem = 0;
    }
    lost_channel_c(const lost_channel_c &) = delete;
    lost_channel_c &operator=(const lost_channel_c &) = delete;

    const modem_pty_c m_tty;
};

struct read_st
{
    int m_status;
    int32_t m_count;
    std::string m_text;
};

/* Reads into a buffer that has just the byte more that the terminator needs. */
read_st read_some(uint32_t length)
{
    std::string buf(length + 1, '\x7F');
    int32_t count = 99;
    const int status = read_at(buf.data(), length, &count);
    return {status, count, buf.substr(0, buf.find('\0'))};
}

TEST(at_write, says_and_logs_the_text)
{
    const modem_line_c line;
    const log_capture_c capture;
    testing::internal::CaptureStdout();
    EXPECT_EQ(write_at("AT^DMSN\r", 8), PUB_ERR_NONE);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "[vx-kel-amt:L912]write_at: AT^DMSN\r\n[vx-kel-amt]write_at return:8\n");
    EXPECT_EQ(line.commands(), texts_t{"AT^DMSN\r"});
    EXPECT_EQ(capture.texts(),
              (texts_t{"write_at()", "write_at write_len[8]", "write_at ret_val[0]", "send ==> AT^DMSN\r"}));
}

TEST(at_write, writes_as_much_as_it_is_told)
{
    const modem_line_c line;
    EXPECT_EQ(write_at("AT^DMPCHN=12\r", 12), PUB_ERR_NONE);
    EXPECT_EQ(write_at("A\0B", 3), PUB_ERR_NONE);
    EXPECT_EQ(line.commands(), (texts_t{"AT^DMPCHN=12", std::string("A\0B", 3)}));
}

TEST(at_write, shows_1023_bytes_of_a_long_text)
{
    const modem_line_c line;
    const std::string text(4095, 'c');
    const log_capture_c capture;
    testing::internal::CaptureStdout();
    EXPECT_EQ(write_at(text.c_str(), 4095), PUB_ERR_NONE);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "[vx-kel-amt:L912]write_at: " + text + "\n[vx-kel-amt]write_at return:4095\n");
    EXPECT_TRUE(capture.has("send ==> " + std::string(1023, 'c')));
}

TEST(at_write, a_short_write_is_no_failure)
{
    const small_file_c file(3);
    g_handle_context.m_fd_at = file.fd();
    const log_capture_c capture;
    EXPECT_EQ(write_at("AT^DMSN\r", 8), PUB_ERR_NONE);
    EXPECT_EQ(capture.texts(),
              (texts_t{"write_at()", "write_at write_len[3]", "write_at ret_val[0]", "send ==> AT^DMSN\r"}));
    g_handle_context.m_fd_at = 0;
}

TEST(at_write, has_a_text)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(write_at(nullptr, 1), PUB_ERR_PARAM);
    EXPECT_EQ(write_at("A", 0), PUB_ERR_PARAM);
    const std::string failed = fail_line("write_at", -101);
    EXPECT_EQ(without_line_numbers(capture), (texts_t{failed, "1, 0", failed, "0, 1"}));
}

TEST(at_write, fails_on_a_closed_channel)
{
    const small_file_c file(100); /* what descriptor 0 is does not count */
    const descriptor_swap_c swap(0, file.fd());
    for (const int fd : {0, -1}) {
        g_handle_context.m_fd_at = fd;
        const log_capture_c capture;
        EXPECT_EQ(write_at("AT\r", 3), PUB_ERR_FAIL);
        EXPECT_EQ(without_line_numbers(capture),
                  (texts_t{"write_at()", "write_at write_len[-1]", "write_at ret_val[-100]",
                           fail_line("write_at", -100, EBADF)}));
    }
    g_handle_context.m_fd_at = 0;
}

TEST(at_write, without_a_modem_a_lost_tty_is_not_looked_for)
{
    const lost_channel_c channel;
    g_handle_state.m_is_no_modem = 1;
    const log_capture_c capture;
    EXPECT_EQ(write_at("AT\r", 3), PUB_ERR_FAIL);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"write_at()", "write_at write_len[-1]", "write_at ret_val[-100]",
                       fail_line("write_at", -100, EIO)}));
    EXPECT_TRUE(channel.m_tty.is_quiet());
}

TEST(at_write, a_lost_tty_is_opened_silenced_and_told_again)
{
    const lost_channel_c channel;
    const int lost_fd = g_handle_context.m_fd_at;
    channel.m_tty.say(CONSENT);
    const log_capture_c capture;
    testing::internal::CaptureStdout();
    EXPECT_EQ(write_at("AT^DMSN\r", 8), PUB_ERR_NONE);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "[vx-kel-amt:L912]write_at: AT^DMSN\r\n[vx-kel-amt]write_at return:-1\n");
    EXPECT_EQ(channel.m_tty.hear(18), "AT^DLKS=0\rAT^DMSN\r");
    EXPECT_EQ(g_handle_context.m_fd_at, lost_fd);
    EXPECT_TRUE(
        holds_in_order(capture.texts(),
                       {"write_at()", "write_at write_len[-1]", "write_at ret_val[-118]",
                        "begin to check if can open device \"" + channel.m_tty.path() + "\"",
                        "(0/30)try to open device \"" + channel.m_tty.path() + "\"", "send ==> AT^DMSN\r"}));
}

TEST(at_write, what_the_reopened_tty_does_not_take_is_a_failure)
{
    const lost_channel_c channel;
    snprintf(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a), "/dev/full");
    const log_capture_c capture;
    EXPECT_EQ(write_at("AT\r", 3), PUB_ERR_FAIL);
    EXPECT_EQ(without_line_numbers(capture).back(), fail_line("write_at", -100, ENOSPC));
}

TEST(at_write, a_short_write_to_the_reopened_tty_has_no_errno)
{
    const lost_channel_c channel;
    const temp_folder_c folder;
    /* A file in the place of the tty, which takes two bytes behind the consent. */
    write_whole_file(folder.path("tty"), std::string(SILENCE) + CONSENT);
    snprintf(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a), "%s", folder.path("tty").c_str());
    const small_file_c limit(sizeof(SILENCE) - 1 + sizeof(CONSENT) - 1 + 2);
    const log_capture_c capture;
    EXPECT_EQ(write_at("AT\r", 3), PUB_ERR_FAIL);
    EXPECT_EQ(without_line_numbers(capture).back(), fail_line("write_at", -100, 0));
    EXPECT_EQ(read_whole_file(folder.path("tty")), std::string(SILENCE) + CONSENT + "AT");
}

TEST(at_write, a_refusal_to_be_silent_is_no_hindrance)
{
    const lost_channel_c channel;
    channel.m_tty.say("\r\n+CME ERROR: 100\r\n");
    const log_capture_c capture;
    EXPECT_EQ(write_at("AT\r", 3), PUB_ERR_NONE);
    EXPECT_EQ(channel.m_tty.hear(13), "AT^DLKS=0\rAT\r");
    EXPECT_EQ(capture.count_containing("FUNC-disable_unsolicited_code(), error_code=-100"), 1);
}

TEST(at_write, a_tty_that_stays_lost_gives_the_error_of_its_opening)
{
    const lost_channel_c channel;
    g_amt_cfg.m_tty_at_mux_a[0] = '\0'; /* refused at once; a missing tty would be waited for */
    const int lost_fd = g_handle_context.m_fd_at;
    const log_capture_c capture;
    EXPECT_EQ(write_at("AT\r", 3), PUB_ERR_PARAM);
    EXPECT_EQ(without_line_numbers(capture).back(), fail_line("write_at", -101, EIO));
    /* It is the lost one still: the next write tries again. */
    EXPECT_EQ(g_handle_context.m_fd_at, lost_fd);
}

TEST(at_read, takes_and_logs_what_is_there)
{
    const modem_line_c line;
    line.answer("\r\nOK\r\n");
    const log_capture_c capture;
    testing::internal::CaptureStdout();
    const read_st result = read_some(100);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "[vx-kel-amt]read_at\n[vx-kel-amt]read_at return:\r\nOK\r\n\n");
    EXPECT_EQ(result.m_status, PUB_ERR_NONE);
    EXPECT_EQ(result.m_count, 6);
    EXPECT_EQ(result.m_text, "\r\nOK\r\n");
    EXPECT_EQ(capture.texts(),
              (texts_t{"read_at read_len_ptr[6] buf_ptr[\r\nOK\r\n]", "receive <== \r\nOK\r\n"}));
}

TEST(at_read, reads_no_more_than_there_is_room)
{
    const modem_pty_c tty;
    g_handle_context.m_fd_at = open(tty.path().c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    tty.say("abcdef");
    EXPECT_EQ(read_some(4).m_text, "abcd");
    EXPECT_EQ(read_some(4).m_text, "ef");
    tty.say("g");
    EXPECT_EQ(read_some(4).m_text, "g");
    amt_handle_close_fd(&g_handle_context.m_fd_at);
}

TEST(at_read, shows_1023_bytes_of_a_long_text)
{
    const modem_line_c line;
    const std::string text(4096, 'a');
    line.answer(text);
    const log_capture_c capture;
    EXPECT_EQ(read_some(4096).m_count, 4096);
    EXPECT_TRUE(capture.has("receive <== " + std::string(1023, 'a')));
    EXPECT_TRUE(capture.has("read_at read_len_ptr[4096] buf_ptr[" + text + "]"));
}

TEST(at_read, has_room_and_a_place_for_the_count)
{
    char buf_a[8] = {'x'};
    int32_t count = 7;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(read_at(nullptr, 4, &count), PUB_ERR_PARAM);
    EXPECT_EQ(read_at(buf_a, 0, &count), PUB_ERR_PARAM);
    EXPECT_EQ(read_at(buf_a, 4, nullptr), PUB_ERR_PARAM);
    const std::string failed = fail_line("read_at", -101);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{failed, "1, 0, 0", failed, "0, 1, 0", failed, "0, 0, 1"}));
    EXPECT_EQ(buf_a[0], 'x');
    EXPECT_EQ(count, 7);
}

TEST(at_read, fails_on_a_closed_channel)
{
    g_handle_context.m_fd_at = 0;
    const log_capture_c capture;
    const read_st result = read_some(8);
    EXPECT_EQ(result.m_status, PUB_ERR_FAIL);
    EXPECT_EQ(result.m_count, -1);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"read_at read_len_ptr[-1] buf_ptr[]", "read_at ret_val[-100]",
                       fail_line("read_at", -100, EBADF)}));
}

TEST(at_read, a_lost_tty_is_opened_silenced_and_heard_again)
{
    /* The flag that keeps a write from looking for it does not keep a read. */
    for (const int is_no_modem : {0, 1}) {
        const lost_channel_c channel;
        g_handle_state.m_is_no_modem = is_no_modem;
        channel.m_tty.say(std::string(CONSENT) + "\r\n^DMSN: 7\r\n");
        const log_capture_c capture;
        const read_st result = read_some(100);
        EXPECT_EQ(result.m_status, PUB_ERR_NONE);
        EXPECT_EQ(result.m_count, 12);
        EXPECT_EQ(result.m_text, "\r\n^DMSN: 7\r\n");
        EXPECT_EQ(channel.m_tty.hear(10), SILENCE);
        EXPECT_TRUE(channel.m_tty.is_quiet());
        EXPECT_EQ(capture.texts().back(), "receive <== \r\n^DMSN: 7\r\n");
        EXPECT_TRUE(capture.has("read_at ret_val[-118]"));
    }
}

TEST(at_read, of_nothing_is_a_good_one)
{
    const modem_line_c line;
    line.answer("");
    const log_capture_c capture;
    const auto begin = std::chrono::steady_clock::now();
    const read_st result = read_some(100);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(90))
        << "it is asked no faster";
    EXPECT_EQ(result.m_status, PUB_ERR_NONE);
    EXPECT_EQ(result.m_count, 0);
    EXPECT_EQ(result.m_text, "");
    EXPECT_EQ(capture.texts(), (texts_t{"read_at read_len_ptr[0] buf_ptr[]", "receive <== "}));
    EXPECT_EQ(line.commands(), texts_t{});
}

TEST(at_read, of_nothing_after_a_hang_up_is_a_loss)
{
    const lost_channel_c channel;
    int fd_a[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fd_a), 0);
    close(fd_a[1]);
    amt_handle_close_fd(&g_handle_context.m_fd_at);
    g_handle_context.m_fd_at = fd_a[0];
    channel.m_tty.say(std::string(CONSENT) + "\r\n^DMSN: 7\r\n");
    const log_capture_c capture;
    EXPECT_EQ(read_some(100).m_text, "\r\n^DMSN: 7\r\n");
    EXPECT_EQ(channel.m_tty.hear(10), SILENCE);
    EXPECT_TRUE(capture.has("read_at read_len_ptr[-1] buf_ptr[]"));
    EXPECT_TRUE(capture.has("read_at ret_val[-118]"));
}

TEST(at_read, of_nothing_after_the_reopening_has_no_errno)
{
    const lost_channel_c channel;
    const temp_folder_c folder;
    /* A file in the place of the tty: the wish for silence goes over its beginning, and nothing is behind the consent. */
    write_whole_file(folder.path("tty"), std::string(SILENCE) + CONSENT);
    snprintf(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a), "%s", folder.path("tty").c_str());
    const log_capture_c capture;
    const read_st result = read_some(100);
    EXPECT_EQ(result.m_status, PUB_ERR_FAIL);
    EXPECT_EQ(result.m_count, 0);
    EXPECT_EQ(without_line_numbers(capture).back(), fail_line("read_at", -100, 0));
}

TEST(at_read, of_one_byte_after_the_reopening_is_a_good_one)
{
    const lost_channel_c channel;
    channel.m_tty.say(std::string(CONSENT) + "x");
    const read_st result = read_some(100);
    EXPECT_EQ(result.m_status, PUB_ERR_NONE);
    EXPECT_EQ(result.m_count, 1);
    EXPECT_EQ(result.m_text, "x");
}

std::atomic<bool> g_hangs_up;

/* Each opening finds a modem that consents, and a line that has hung up behind it. */
TEST(at_open, a_line_that_is_lost_again_and_again_is_given_up)
{
    const lost_channel_c channel;
    const temp_folder_c folder;
    const std::string path = folder.path("tty");
    write_whole_file(path, std::string(SILENCE) + CONSENT);
    snprintf(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a), "%s", path.c_str());
    const log_capture_c capture;
    g_hangs_up = true;
    errno = 0;
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(amt_at_open(), PUB_ERR_FILE);
    g_hangs_up = false;
    EXPECT_EQ(errno, EIO);
    EXPECT_EQ(capture.count_containing("(0/30)try to open device \"" + path + "\""), 30);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(2900));
}

TEST(at_read, a_tty_that_stays_lost_gives_the_error_of_its_opening)
{
    const lost_channel_c channel;
    g_amt_cfg.m_tty_at_mux_a[0] = '\0';
    EXPECT_EQ(read_some(100).m_status, PUB_ERR_PARAM);
}

} // namespace

extern "C" int poll(pollfd *fd_ptr, nfds_t count, int timeout_ms)
{
    if (g_hangs_up) {
        fd_ptr->revents = POLLHUP;
        return 1;
    }
    using poll_func = int (*)(pollfd *, nfds_t, int);
    static const poll_func next = reinterpret_cast<poll_func>(dlsym(RTLD_NEXT, "poll"));
    return next(fd_ptr, count, timeout_ms);
}
