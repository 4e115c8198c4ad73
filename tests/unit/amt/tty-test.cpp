#include "amt/amt-handle/channel/tty.h"

#include <fcntl.h>
#include <stdio.h>
#include <termios.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-pty.h"
#include "tests/unit/support/log-capture.h"

namespace {

bool is_open(int fd)
{
    return fcntl(fd, F_GETFD) != -1;
}

class tty : public testing::Test {
protected:
    void TearDown() override
    {
        amt_handle_close_fd(&m_fd);
        amt_handle_close_fd(&g_handle_context.m_fd_modem);
        amt_handle_close_fd(&g_handle_context.m_fd_at);
        g_handle_context.m_fd_modem = 0;
        g_handle_context.m_fd_at = 0;
        g_amt_cfg = {};
    }

    static void use_modem(const std::string &path)
    {
        snprintf(g_amt_cfg.m_tty_modem_a, sizeof(g_amt_cfg.m_tty_modem_a), "%s", path.c_str());
    }

    const modem_pty_c m_tty;
    std::atomic<int> m_fd{0};
};

TEST_F(tty, is_opened_for_both_directions)
{
    ASSERT_EQ(amt_tty_open(&m_fd, m_tty.path().c_str(), 1), PUB_ERR_NONE);
    ASSERT_GT(m_fd, 0);
    EXPECT_EQ(fcntl(m_fd, F_GETFL) & O_ACCMODE, O_RDWR);
    EXPECT_EQ(fcntl(m_fd, F_GETFL) & O_NONBLOCK, 0);
    EXPECT_EQ(fcntl(m_fd, F_GETFD), FD_CLOEXEC);
    EXPECT_EQ(write(m_fd, "to", 2), 2);
    EXPECT_EQ(m_tty.hear(2), "to");
    m_tty.say("fro");
    char text_a[8] = {};
    EXPECT_EQ(read(m_fd, text_a, sizeof(text_a)), 3);
    EXPECT_STREQ(text_a, "fro");
}

TEST_F(tty, opened_again_takes_the_place_of_the_first)
{
    ASSERT_EQ(amt_tty_open(&m_fd, m_tty.path().c_str(), 1), PUB_ERR_NONE);
    const int first = m_fd;
    const modem_pty_c other_tty;
    const int unused = dup(first); /* the number that a second descriptor would get, were one kept */
    close(unused);
    ASSERT_EQ(amt_tty_open(&m_fd, other_tty.path().c_str(), 1), PUB_ERR_NONE);
    EXPECT_EQ(m_fd, first) << "another thread may be about to read from that number";
    EXPECT_EQ(fcntl(m_fd, F_GETFD), FD_CLOEXEC);
    EXPECT_EQ(write(m_fd, "to", 2), 2);
    EXPECT_EQ(other_tty.hear(2), "to");
    EXPECT_TRUE(m_tty.is_quiet());
    EXPECT_FALSE(is_open(unused));
}

TEST_F(tty, opened_again_revives_a_closed_number)
{
    for (const int number : {0, -1, 900}) {
        m_fd = number;
        ASSERT_EQ(amt_tty_open(&m_fd, m_tty.path().c_str(), 1), PUB_ERR_NONE);
        EXPECT_TRUE(is_open(m_fd));
        EXPECT_EQ(m_fd == 900, number == 900);
        amt_handle_close_fd(&m_fd);
    }
}

TEST_F(tty, that_cannot_be_opened_leaves_the_first)
{
    ASSERT_EQ(amt_tty_open(&m_fd, m_tty.path().c_str(), 1), PUB_ERR_NONE);
    const int first = m_fd;
    EXPECT_EQ(amt_tty_open(&m_fd, "", 1), PUB_ERR_PARAM);
    EXPECT_EQ(amt_tty_open(&m_fd, "/dev/null/none", 1), PUB_ERR_FILE);
    EXPECT_EQ(m_fd, first);
    EXPECT_TRUE(is_open(first));
}

TEST_F(tty, modem_is_opened_by_its_setting)
{
    use_modem(m_tty.path());
    const log_capture_c capture;
    EXPECT_EQ(amt_tty_open_modem(), PUB_ERR_NONE);
    EXPECT_GT(g_handle_context.m_fd_modem, 0);
    EXPECT_EQ(capture.count_containing("(0/60)try to open device \"" + m_tty.path() + "\""), 1);
    EXPECT_EQ(capture.texts().back(), "pub_util_try_to_open_device, handle_context_st.m_fd_modem  = " +
                                          std::to_string(g_handle_context.m_fd_modem) +
                                          ", amt_cfg_st.m_tty_modem_a = " + m_tty.path() + "\n");
}

TEST_F(tty, at_channel_is_opened_by_its_setting)
{
    snprintf(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a), "%s", m_tty.path().c_str());
    const log_capture_c capture;
    EXPECT_EQ(amt_tty_open_at(), PUB_ERR_NONE);
    EXPECT_EQ(capture.count_containing("(0/30)try to open device \"" + m_tty.path() + "\""), 1);
    EXPECT_TRUE(m_tty.is_quiet());
}

TEST_F(tty, only_a_serial_port_has_a_speed)
{
    ASSERT_EQ(amt_tty_open(&g_handle_context.m_fd_modem, m_tty.path().c_str(), 1), PUB_ERR_NONE);
    const auto get_speed = [] {
        termios attr = {};
        EXPECT_EQ(tcgetattr(g_handle_context.m_fd_modem, &attr), 0);
        return cfgetospeed(&attr);
    };
    const speed_t before = get_speed();
    ASSERT_NE(before, speed_t{B460800});
    for (const char *const path : {"/dev/ttyUSB0", "/dev/ttyGS0", "/dev/tty", "ttyS0", "/x/dev/ttyS0", ""}) {
        use_modem(path);
        amt_tty_set_modem_speed(460800);
        EXPECT_EQ(get_speed(), before) << path;
    }
    use_modem("/dev/ttyS3");
    amt_tty_set_modem_speed(460800);
    EXPECT_EQ(get_speed(), speed_t{B460800});
}

} // namespace
