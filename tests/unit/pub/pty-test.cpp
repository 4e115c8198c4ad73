#include "pub/pty/pty.h"

#include <errno.h>
#include <fcntl.h>
#include <filesystem>
#include <stddef.h>
#include <stdlib.h>
#include <string.h>
#include <string>
#include <sys/ioctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <system_error>
#include <termios.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace fs = std::filesystem;

namespace {

#ifdef SYS_chmod
constexpr long CHMOD_CALL = SYS_chmod;
#else
constexpr long CHMOD_CALL = SYS_fchmodat;
#endif

std::string pty_error(const std::string &func, int error_code, int error_number)
{
    return error_line("pty/pty", func, error_code, error_number);
}

bool is_link(const std::string &path)
{
    return fs::is_symlink(fs::symlink_status(path));
}

bool is_open(int fd)
{
    return fcntl(fd, F_GETFD) >= 0;
}

/* What stands in the brackets at the end of a log text. */
std::string in_brackets(const std::string &text)
{
    const size_t begin = text.find('[') + 1;
    return text.substr(begin, text.size() - 1 - begin);
}

int open_descriptors()
{
    int count = 0;
    for ([[maybe_unused]] const fs::directory_entry &entry : fs::directory_iterator("/proc/self/fd")) {
        count++;
    }
    return count;
}

/* A channel with a mapping name in a directory of its own. */
class pty : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_NE(mkdtemp(m_folder.data()), nullptr);
        use_mapping(path("app"));
    }
    void TearDown() override
    {
        std::error_code ignored;
        fs::remove_all(m_folder, ignored);
        if (m_pty.m_ptm_fd > 0) {
            close(m_pty.m_ptm_fd);
        }
    }
    void use_mapping(const std::string &mapping)
    {
        m_mapping = mapping;
        ASSERT_LT(mapping.size(), sizeof(m_pty.m_pts_mapping_name_a));
        memset(m_pty.m_pts_mapping_name_a, 0, sizeof(m_pty.m_pts_mapping_name_a));
        memcpy(m_pty.m_pts_mapping_name_a, mapping.data(), mapping.size());
    }
    std::string path(const std::string &name) const
    {
        return m_folder + "/" + name;
    }
    std::string fd() const
    {
        return std::to_string(m_pty.m_ptm_fd);
    }
    std::string slave() const
    {
        return m_pty.m_pts_name_a;
    }

    /* The log of an open from its entry to the link; the mapping path held something before, or nothing. */
    lines_t begin_lines(const std::string &old_fd, bool is_replaced) const
    {
        lines_t text_list = {
            "pub_pty_open m_ptm_fd[" + old_fd + "]",
            "pub_pty_open m_ptm_fd[" + fd() + "]",
            "create_pts_mapping pts_name_ptr[" + slave() + "]",
            "create_pts_mapping m_pts_name_a[" + slave() + "] ret_val[0]",
            "create_pts_mapping unlink(" + m_mapping + ") ret_val[" + (is_replaced ? "0" : "-1") + "]",
        };
        if (is_replaced) {
            text_list.push_back("create_pts_mapping \"" + m_mapping + "\" not exists");
        }
        text_list.push_back("create_pts_mapping symlink(" + slave() + ", " + m_mapping + ") ret_val[0]");
        return text_list;
    }
    /* The rest of the log of an open that succeeds. */
    lines_t end_lines() const
    {
        return {
            "create_pts_mapping chmod(" + m_mapping + ", 432) ret_val[0]",
            "create_pts_mapping chown(" + m_mapping + ", 1000, 1001) ret_val[0]",
            "create_pts_mapping m_pts_mapping_name_a[" + m_mapping + "] ret_val[0]",
            "set_ptm_attr fd[" + fd() + "]",
            "set_ptm_attr tcgetattr(" + fd() + ") ret_val[0]",
            "set_ptm_attr tcsetattr(" + fd() + ") ret_val[0]",
            "set_ptm_attr grantpt(" + fd() + ") ret_val[0]",
            "set_ptm_attr unlockpt(" + fd() + ") ret_val[0]",
            "set_ptm_attr fd[" + fd() + "] ret_val[0]",
            "pub_pty_open \"" + m_mapping + "\" exists",
            "pub_pty_open m_ptm_fd[" + fd() + "]; m_pts_name_a[" + slave() + "] m_pts_mapping_name_a[" +
                m_mapping + "]",
        };
    }
    lines_t delete_lines() const
    {
        return {"pub_pty_delete_mapping unlink(" + m_mapping + ") ret_val[0]"};
    }
    lines_t vanished_lines() const
    {
        return {"WARNING !", "pub_pty_delete_mapping \"" + m_mapping + "\" does not exist"};
    }

    std::string m_folder = "/tmp/vxXXXXXX"; /* short: a mapping name has 27 characters */
    std::string m_mapping;
    pub_pty_st m_pty = {};
};

const lines_t CLOSE_LINE = {"pub_pty_close pub_pty_delete_mapping ret_val[0]"};

} // namespace

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
