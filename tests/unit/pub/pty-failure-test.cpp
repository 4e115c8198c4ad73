#include "pub/pty/pty.h"

#include <errno.h>
#include <fcntl.h>
#include <filesystem>
#include <string>
#include <sys/ioctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/pty-channel.h"
#include "tests/unit/support/log-capture.h"

/* What a channel does when something is in its way. */

namespace fs = std::filesystem;

namespace {

#ifdef SYS_chmod
constexpr long CHMOD_CALL = SYS_chmod;
#else
constexpr long CHMOD_CALL = SYS_fchmodat;
#endif

} // namespace

TEST_F(pty, empty_mapping_name)
{
    use_mapping("");
    const int descriptors = open_descriptors();
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_pty_open(&m_pty), PUB_ERR_PARAM);
    EXPECT_EQ(m_pty.m_ptm_fd, -1);
    EXPECT_EQ(open_descriptors(), descriptors);
    const lines_t text_list = without_line_numbers(capture);
    ASSERT_EQ(text_list.size(), 9U);
    EXPECT_EQ(text_list[2], pty_error("create_pts_mapping", -101, 0));
    EXPECT_EQ(text_list[3], "[PTY]0, 0, 1");
    EXPECT_EQ(lines_t(text_list.begin() + 4, text_list.end()),
              vanished_lines() + vanished_lines() + CLOSE_LINE);
}

TEST_F(pty, link_that_cannot_be_made)
{
    use_mapping(path("none/app"));
    const int descriptors = open_descriptors();
    const log_capture_c capture;
    EXPECT_EQ(pub_pty_open(&m_pty), PUB_ERR_FILE);
    EXPECT_EQ(m_pty.m_ptm_fd, -1);
    EXPECT_EQ(open_descriptors(), descriptors);
    const lines_t text_list = without_line_numbers(capture);
    ASSERT_EQ(text_list.size(), 15U);
    const std::string slave_name = in_brackets(text_list[2]);
    const lines_t expected_list =
        lines_t{"create_pts_mapping unlink(" + m_mapping + ") ret_val[-1]",
                "create_pts_mapping symlink(" + slave_name + ", " + m_mapping + ") ret_val[-1]",
                sys_call_line("symlink", ENOENT),
                pty_error("create_pts_mapping", -1, ENOENT),
                pty_error("create_pts_mapping", -118, ENOENT),
                "[PTY]map " + m_mapping + " -> " + slave_name + " failed"} +
        vanished_lines() + vanished_lines() + CLOSE_LINE;
    EXPECT_EQ(lines_t(text_list.begin() + 4, text_list.end()), expected_list);
}

TEST_F(pty, close_after_the_link_has_vanished)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    ASSERT_TRUE(fs::remove(m_mapping));
    const log_capture_c capture;
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(m_pty.m_ptm_fd, -1);
    EXPECT_EQ(capture.texts(), vanished_lines() + CLOSE_LINE);
}

TEST_F(pty, close_of_a_closed_channel)
{
    m_pty.m_ptm_fd = -1;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_SYS_CALL);
    EXPECT_EQ(pub_pty_close(nullptr), PUB_ERR_SYS_CALL);
    const std::string error = pty_error("pub_pty_close", -101, 0);
    EXPECT_THAT(without_line_numbers(capture), testing::ElementsAre(error, "0, 1", error, "1, 0"));
}

TEST_F(pty, close_before_first_use_spares_descriptor_0)
{
    ASSERT_TRUE(is_open(0));
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(m_pty.m_ptm_fd, -1);
    EXPECT_TRUE(is_open(0));
}

TEST_F(pty, link_that_cannot_be_removed_keeps_the_master_open)
{
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    ASSERT_TRUE(fs::remove(m_mapping));
    ASSERT_TRUE(fs::create_directory(m_mapping));
    const log_capture_c capture;
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_FILE);
    EXPECT_TRUE(is_open(m_pty.m_ptm_fd));
    EXPECT_NE(slave(), "");
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("pub_pty_delete_mapping unlink(" + m_mapping + ") ret_val[-1]",
                                     sys_call_line("unlink", EISDIR),
                                     pty_error("pub_pty_delete_mapping", -1, EISDIR),
                                     "pub_pty_close pub_pty_delete_mapping ret_val[-118]"));
    ASSERT_TRUE(fs::remove(m_mapping));
    EXPECT_EQ(pub_pty_close(&m_pty), PUB_ERR_NONE);
}

TEST_F(pty, repeated_opens_over_a_directory_hold_one_master)
{
    ASSERT_TRUE(fs::create_directory(m_mapping));
    EXPECT_EQ(pub_pty_open(&m_pty), PUB_ERR_FILE);
    EXPECT_TRUE(is_open(m_pty.m_ptm_fd));
    const int descriptors = open_descriptors();
    for (int i = 0; i < 5; i++) {
        EXPECT_EQ(pub_pty_open(&m_pty), PUB_ERR_FILE);
    }
    EXPECT_EQ(open_descriptors(), descriptors);
    ASSERT_TRUE(fs::remove(m_mapping));
    ASSERT_EQ(pub_pty_open(&m_pty), PUB_ERR_NONE);
    EXPECT_EQ(open_descriptors(), descriptors);
}

TEST_F(pty, delete_mapping_of_no_channel)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_pty_delete_mapping(nullptr), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(pty_error("pub_pty_delete_mapping", -101, 0), "[PTY]1"));
}

TEST_F(pty, delete_mapping_removes_a_link_to_nowhere)
{
    fs::create_symlink("/dev/pts/none", m_mapping);
    const log_capture_c capture;
    EXPECT_EQ(pub_pty_delete_mapping(&m_pty), PUB_ERR_NONE);
    EXPECT_FALSE(is_link(m_mapping));
    EXPECT_EQ(capture.texts(), delete_lines());
}

TEST_F(pty, open_of_no_channel)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_pty_open(nullptr), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture), testing::ElementsAre(pty_error("pub_pty_open", -101, 0)));
}

TEST_F(pty, master_that_cannot_be_opened)
{
    const child_run_st run = run_in_child([this] {
        const rlimit none = {0, 0};
        setrlimit(RLIMIT_NOFILE, &none);
        const int status = pub_pty_open(&m_pty);
        return m_pty.m_ptm_fd == -1 ? status : 0;
    });
    EXPECT_EQ(run.m_result, PUB_ERR_FILE);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre("pub_pty_open m_ptm_fd[0]", "pub_pty_open m_ptm_fd[-1]",
                                     sys_call_line("open", EMFILE), pty_error("pub_pty_open", -1, EMFILE),
                                     pty_error("pub_pty_close", -101, EMFILE), "0, 1"));
}

TEST_F(pty, mode_that_cannot_be_set)
{
    const child_run_st run = run_in_child([this] { return pub_pty_open(&m_pty); }, {CHMOD_CALL, EROFS});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_FILE);
    const lines_t expected_list =
        lines_t{"create_pts_mapping chmod(" + m_mapping + ", 432) ret_val[-1]", sys_call_line("chmod", EROFS),
                pty_error("create_pts_mapping", -1, EROFS)} +
        delete_lines() + vanished_lines() + CLOSE_LINE;
    ASSERT_GT(run.m_text_list.size(), 6U);
    EXPECT_EQ(lines_t(run.m_text_list.begin() + 6, run.m_text_list.end()), expected_list);
    EXPECT_FALSE(is_link(m_mapping));
}

struct refused_request_st
{
    std::string m_call;
    unsigned long m_request;
};

class pty_request : public pty, public testing::WithParamInterface<refused_request_st> {};

/* A failing step of the line's set-up is logged, ends the set-up, and takes link and master with it. */
TEST_P(pty_request, refused)
{
    const child_run_st run =
        run_in_child([this] { return pub_pty_open(&m_pty); },
                     {SYS_ioctl, EIO, true, static_cast<uint32_t>(GetParam().m_request)});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_FILE);
    const lines_t text_list = run.m_text_list;
    ASSERT_GT(text_list.size(), 6U);
    const std::string master = in_brackets(text_list[1]);
    const lines_t tail = lines_t{"set_ptm_attr " + GetParam().m_call + "(" + master + ") ret_val[-1]",
                                 sys_call_line(GetParam().m_call, EIO), pty_error("set_ptm_attr", -1, EIO),
                                 "set_ptm_attr fd[" + master + "] ret_val[-118]"} +
                         delete_lines() + CLOSE_LINE;
    ASSERT_GT(text_list.size(), tail.size());
    EXPECT_EQ(lines_t(text_list.end() - static_cast<long>(tail.size()), text_list.end()), tail);
    EXPECT_FALSE(is_link(m_mapping));
}

INSTANTIATE_TEST_SUITE_P(requests, pty_request,
                         testing::Values(refused_request_st{"tcgetattr", TCGETS},
                                         refused_request_st{"tcsetattr", TCSETS},
                                         refused_request_st{"unlockpt", TIOCSPTLCK}));

TEST_F(pty, set_up_of_what_is_no_terminal)
{
    const int null_fd = open("/dev/null", O_RDWR);
    const std::string name = std::to_string(null_fd);
    const log_capture_c capture;
    EXPECT_EQ(set_ptm_attr(null_fd), PUB_ERR_FILE);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(
                    "set_ptm_attr fd[" + name + "]", "set_ptm_attr tcgetattr(" + name + ") ret_val[-1]",
                    sys_call_line("tcgetattr", ENOTTY), pty_error("set_ptm_attr", -1, ENOTTY),
                    "set_ptm_attr fd[" + name + "] ret_val[-118]"));
    close(null_fd);
}

TEST_F(pty, mapping_of_what_is_no_terminal)
{
    m_pty.m_ptm_fd = open("/dev/null", O_RDWR);
    const log_capture_c capture;
    EXPECT_EQ(create_pts_mapping(&m_pty), PUB_ERR_FILE);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre("create_pts_mapping pts_name_ptr[(null)]",
                                     sys_call_line("ptsname", ENOTTY),
                                     pty_error("create_pts_mapping", -1, ENOTTY)));
    EXPECT_FALSE(is_link(m_mapping));
}

TEST_F(pty, descriptor_0_is_open_but_no_terminal_s_master)
{
    m_pty.m_ptm_fd = 0;
    const log_capture_c capture;
    EXPECT_EQ(create_pts_mapping(&m_pty), PUB_ERR_FILE);
    EXPECT_EQ(capture.count_containing("[PTY]"), 0);
    m_pty.m_ptm_fd = -1;
}

TEST_F(pty, mapping_of_a_closed_or_absent_channel)
{
    m_pty.m_ptm_fd = -1;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(create_pts_mapping(&m_pty), PUB_ERR_PARAM);
    EXPECT_EQ(create_pts_mapping(nullptr), PUB_ERR_PARAM);
    const std::string error = pty_error("create_pts_mapping", -101, 0);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(error, "[PTY]0, 1, 0", error, "[PTY]1, 0, 0"));
}
