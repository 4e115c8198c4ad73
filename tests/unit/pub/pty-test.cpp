#include "pub/pty/pty.h"

#include <fcntl.h>
#include <filesystem>
#include <stddef.h>
#include <string>
#include <sys/stat.h>
#include <termios.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/pub/support/pty-channel.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace fs = std::filesystem;

TEST(pty_record, layout)
{
    EXPECT_EQ(offsetof(pub_pty_st, m_ptm_fd), 0U);
    EXPECT_EQ(sizeof(pub_pty_st::m_pts_name_a), 40U);
    EXPECT_EQ(sizeof(pub_pty_st::m_pts_mapping_name_a), 28U);
    EXPECT_LT(offsetof(pub_pty_st, m_pts_mapping_name_a), offsetof(pub_pty_st, m_is_nonblock));
}

TEST_F(pty, open_publishes_the_slave)
{
    const log_capture_c capture;
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_GT(m_pty.m_ptm_fd, 0);
    EXPECT_EQ(fcntl(m_pty.m_ptm_fd, F_GETFD), FD_CLOEXEC);
    EXPECT_EQ(fs::read_symlink(m_mapping), slave());
    EXPECT_EQ(slave().rfind("/dev/pts/", 0), 0U);
    struct stat status = {};
    ASSERT_EQ(stat(m_mapping.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0660U);
    if (geteuid() == 0) {
        EXPECT_EQ(status.st_uid, 1000U);
        EXPECT_EQ(status.st_gid, 1001U);
    }
    EXPECT_EQ(capture.texts(), begin_lines("0", false) + end_lines());
}

TEST_F(pty, line_is_raw_and_the_rest_stays)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    const int fresh_fd = open("/dev/ptmx", O_RDWR | O_NOCTTY);
    termios fresh = {};
    termios raw = {};
    ASSERT_EQ(tcgetattr(fresh_fd, &fresh), 0);
    ASSERT_EQ(tcgetattr(m_pty.m_ptm_fd, &raw), 0);
    close(fresh_fd);
    EXPECT_EQ(raw.c_iflag, 0U);
    EXPECT_EQ(raw.c_oflag, fresh.c_oflag & ~static_cast<tcflag_t>(OPOST | OLCUC | OCRNL | ONOCR | ONLRET));
    EXPECT_EQ(raw.c_lflag, fresh.c_lflag & ~static_cast<tcflag_t>(ISIG | ICANON | ECHO | ECHOE));
    EXPECT_NE(raw.c_lflag, 0U) << "only those four are cleared";
    EXPECT_EQ(raw.c_cflag, fresh.c_cflag);
    EXPECT_EQ(memcmp(raw.c_cc, fresh.c_cc, sizeof(raw.c_cc)), 0);
}

TEST_F(pty, bytes_pass_unchanged_both_ways)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    const int app_fd = open(m_mapping.c_str(), O_RDWR | O_NOCTTY);
    ASSERT_GE(app_fd, 0);
    const std::string data("\x00\x03\x04\x0A\x0D\x11\x13\x1A\x1C\x7F\xBB\xFF", 12);
    char buf_a[64];
    ASSERT_EQ(write(app_fd, data.data(), data.size()), 12);
    ASSERT_EQ(read(m_pty.m_ptm_fd, buf_a, sizeof(buf_a)), 12);
    EXPECT_EQ(std::string(buf_a, 12), data);
    ASSERT_EQ(write(m_pty.m_ptm_fd, data.data(), data.size()), 12);
    ASSERT_EQ(read(app_fd, buf_a, sizeof(buf_a)), 12);
    EXPECT_EQ(std::string(buf_a, 12), data);
    close(app_fd);
}

TEST_F(pty, blocking_unless_asked)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(fcntl(m_pty.m_ptm_fd, F_GETFL) & O_NONBLOCK, 0);
}

TEST_F(pty, nonblocking_when_asked)
{
    m_pty.m_is_nonblock = 1;
    const log_capture_c capture;
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_NE(fcntl(m_pty.m_ptm_fd, F_GETFL) & O_NONBLOCK, 0);
    lines_t expected_list = begin_lines("0", false) + end_lines();
    const lines_t mode_lines = {"pub_util_set_fd_mode()",
                                "pub_util_set_fd_mode fd[" + fd() + "] is_nonblock_mode[1]",
                                "pub_util_set_fd_mode return ERR_NONE"};
    expected_list.insert(expected_list.end() - 2, mode_lines.begin(), mode_lines.end());
    EXPECT_EQ(capture.texts(), expected_list);
}

TEST_F(pty, close_removes_the_link_and_keeps_the_mapping_name)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    const int master = m_pty.m_ptm_fd;
    const log_capture_c capture;
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(m_pty.m_ptm_fd, -1);
    EXPECT_FALSE(is_open(master));
    EXPECT_FALSE(is_link(m_mapping));
    EXPECT_EQ(std::string(m_pty.m_pts_name_a, sizeof(m_pty.m_pts_name_a)), std::string(40, '\0'));
    EXPECT_EQ(m_pty.m_pts_mapping_name_a, m_mapping);
    EXPECT_EQ(capture.texts(), delete_lines() + CLOSE_LINE);
}

TEST_F(pty, opens_again_after_a_close)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    ASSERT_EQ(pub_pty_close(&m_pty), PUB_ERR_NONE);
    const log_capture_c capture;
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(fs::read_symlink(m_mapping), slave());
    EXPECT_EQ(capture.texts(), begin_lines("-1", false) + end_lines());
}

TEST_F(pty, open_of_an_open_channel_closes_it_first)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    const std::string old_fd = fd();
    const int descriptors = open_descriptors();
    const log_capture_c capture;
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(open_descriptors(), descriptors);
    EXPECT_EQ(fs::read_symlink(m_mapping), slave());
    lines_t expected_list = begin_lines(old_fd, false) + end_lines();
    const lines_t close_lines = delete_lines() + CLOSE_LINE;
    expected_list.insert(expected_list.begin() + 1, close_lines.begin(), close_lines.end());
    EXPECT_EQ(capture.texts(), expected_list);
}

TEST_F(pty, stale_file_is_replaced)
{
    write_whole_file(m_mapping, "left over");
    const log_capture_c capture;
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(fs::read_symlink(m_mapping), slave());
    EXPECT_EQ(capture.texts(), begin_lines("0", true) + end_lines());
}

TEST_F(pty, stale_link_to_nowhere_is_replaced)
{
    fs::create_symlink("/dev/pts/none", m_mapping);
    const log_capture_c capture;
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(fs::read_symlink(m_mapping), slave());
    EXPECT_EQ(capture.texts(), begin_lines("0", true) + end_lines());
}

TEST_F(pty, longest_mapping_name)
{
    use_mapping(path(std::string(27 - path("").size(), 'a')));
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_TRUE(is_link(m_mapping));
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_NONE);
    EXPECT_FALSE(is_link(m_mapping));
}
