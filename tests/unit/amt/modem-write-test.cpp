#include "amt/amt-handle/at/at-command.h"

#include <chrono>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-pty.h"
#include "tests/unit/amt/small-file.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

const std::string REQUEST = "ATI\r";
constexpr char WRITTEN[] = "write to modem: : (data_len = 4) -- 4154490D";
constexpr char NOTHING_WRITTEN[] = "write to modem: : (data_len = 0) -- ";

class modem_write : public testing::Test {
protected:
    void SetUp() override
    {
        hold(REQUEST);
        use_path(m_tty.path());
    }
    void TearDown() override
    {
        amt_handle_close_fd(&g_handle_context.m_fd_modem);
        g_handle_context.m_fd_modem = 0;
        use_path("");
        amt_handle_clear_buf(&g_handle_context.m_req);
    }

    static void hold(const std::string &text)
    {
        amt_handle_clear_buf(&g_handle_context.m_req);
        g_handle_context.m_req.m_buf_len =
            static_cast<uint32_t>(text.copy(reinterpret_cast<char *>(g_handle_context.m_req.m_buf_a), 4095));
    }
    static void use_path(const std::string &path)
    {
        snprintf(g_amt_cfg.m_tty_modem_a, sizeof(g_amt_cfg.m_tty_modem_a), "%s", path.c_str());
    }

    static std::string opened_line(const std::string &path)
    {
        return "pub_util_try_to_open_device, handle_context_st.m_fd_modem  = " +
               std::to_string(g_handle_context.m_fd_modem) + ", amt_cfg_st.m_tty_modem_a = " + path + "\n";
    }

    const modem_pty_c m_tty;
};

TEST_F(modem_write, whole_request_goes_out)
{
    g_handle_context.m_fd_modem = open(m_tty.path().c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    const log_capture_c capture;
    EXPECT_EQ(amt_modem_write_request(), PUB_ERR_NONE);
    EXPECT_EQ(m_tty.hear(REQUEST.size()), REQUEST);
    EXPECT_EQ(capture.texts(), texts_t{WRITTEN});

    const std::string longest(4095, 'l');
    hold(longest);
    EXPECT_EQ(amt_modem_write_request(), PUB_ERR_NONE);
    EXPECT_EQ(m_tty.hear(longest.size()), longest);
}

TEST_F(modem_write, short_write_is_a_failure)
{
    const small_file_c file(3);
    g_handle_context.m_fd_modem = dup(file.fd());
    const auto begin = std::chrono::steady_clock::now();
    const log_capture_c capture;
    EXPECT_EQ(amt_modem_write_request(), PUB_ERR_FAIL);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(20));
    EXPECT_EQ(capture.texts(), texts_t{"write to modem: : (data_len = 3) -- 415449"});
}

TEST_F(modem_write, other_errors_are_failures)
{
    g_handle_context.m_fd_modem = open("/dev/full", O_WRONLY | O_CLOEXEC);
    const auto begin = std::chrono::steady_clock::now();
    const log_capture_c capture;
    EXPECT_EQ(amt_modem_write_request(), PUB_ERR_FAIL);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(20));
    EXPECT_EQ(capture.texts(), (texts_t{"write error 2, errno[28]", NOTHING_WRITTEN}));
    EXPECT_TRUE(m_tty.is_quiet());
}

TEST_F(modem_write, lost_or_closed_tty_is_opened_again)
{
    for (const bool is_lost : {true, false}) {
        const int old_fd = is_lost ? open_lost_tty() : -1;
        g_handle_context.m_fd_modem = old_fd;
        const auto begin = std::chrono::steady_clock::now();
        const log_capture_c capture;
        EXPECT_EQ(amt_modem_write_request(), PUB_ERR_NONE);
        EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(20));
        const texts_t text_list = capture.texts();
        EXPECT_EQ(text_list.front(), is_lost ? "write error 1, errno[5]" : "write error 1, errno[9]");
        ASSERT_GE(text_list.size(), 3U);
        EXPECT_EQ(text_list[text_list.size() - 2], opened_line(m_tty.path()));
        EXPECT_EQ(text_list.back(), NOTHING_WRITTEN);
        EXPECT_EQ(capture.count_containing("(0/60)try to open device"), 1);
        EXPECT_EQ(capture.count_containing("convert speed"), 0);
        /* What was to be written is lost; the line serves the next. */
        EXPECT_TRUE(m_tty.is_quiet());
        EXPECT_GT(g_handle_context.m_fd_modem, 0);
        EXPECT_EQ(amt_modem_write_request(), PUB_ERR_NONE);
        EXPECT_EQ(m_tty.hear(REQUEST.size()), REQUEST);
        amt_handle_close_fd(&g_handle_context.m_fd_modem);
    }
}

TEST_F(modem_write, result_is_that_of_the_opening)
{
    use_path(""); /* refused at once; a missing tty would be waited for */
    g_handle_context.m_fd_modem = -1;
    const log_capture_c capture;
    EXPECT_EQ(amt_modem_write_request(), PUB_ERR_PARAM);
    const texts_t text_list = capture.texts();
    EXPECT_EQ(text_list[text_list.size() - 2], opened_line(""));
    EXPECT_EQ(text_list.back(), NOTHING_WRITTEN);
}

} // namespace
