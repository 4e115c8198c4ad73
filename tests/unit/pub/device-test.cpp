#include "pub/util/util.h"

#include <chrono>
#include <errno.h>
#include <fcntl.h>
#include <pty.h>
#include <string.h>
#include <string>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <termios.h>
#include <thread>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/descriptor-swap.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace {

using clock_t_c = std::chrono::steady_clock;

const std::string OPEN_DEVICE = "pub_util_try_to_open_device";
const std::string SERIAL_ATTR = "pub_util_set_serial_dev_attr";
const std::string FD_MODE = "pub_util_set_fd_mode";

#ifdef SYS_fcntl64
constexpr long FCNTL_CALL = SYS_fcntl64;
#else
constexpr long FCNTL_CALL = SYS_fcntl;
#endif

std::string util_error(const std::string &func, int error_code, int error_number)
{
    return error_line("util/util", func, error_code, error_number);
}

long elapsed_ms(clock_t_c::time_point start)
{
    return static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(clock_t_c::now() - start).count());
}

std::string try_line(int attempt, int attempts, const std::string &path)
{
    return "(" + std::to_string(attempt) + "/" + std::to_string(attempts) + ")try to open device \"" + path +
           "\"";
}

lines_t open_begin(int attempts, const std::string &path)
{
    return {OPEN_DEVICE + "()", "begin to check if can open device \"" + path + "\"",
            try_line(0, attempts, path)};
}

void add_open_failure(lines_t *text_list_ptr, const std::string &path, int error_number)
{
    text_list_ptr->push_back(util_error(OPEN_DEVICE, -118, error_number));
    text_list_ptr->push_back("open device \"" + path + "\" fail: " + std::to_string(error_number) + " - " +
                             strerror(error_number));
}

/* A pseudo-terminal; its slave stands for a serial port. */
class serial_port_c {
public:
    serial_port_c()
    {
        EXPECT_EQ(openpty(&m_master, &m_slave, nullptr, nullptr, nullptr), 0);
    }
    ~serial_port_c()
    {
        close(m_master);
        close(m_slave);
    }
    serial_port_c(const serial_port_c &) = delete;
    serial_port_c &operator=(const serial_port_c &) = delete;

    int fd() const
    {
        return m_slave;
    }
    std::string name() const
    {
        return ttyname(m_slave);
    }
    termios attributes() const
    {
        termios attr = {};
        EXPECT_EQ(tcgetattr(m_slave, &attr), 0);
        return attr;
    }

private:
    int m_master = -1;
    int m_slave = -1;
};

} // namespace

TEST(open_device, opens_with_the_given_flags)
{
    const temp_folder_c dir;
    const std::string path = dir.path("device");
    write_whole_file(path, "");
    int fd = -5;
    const log_capture_c capture;
    ASSERT_EQ(pub_util_try_to_open_device(&fd, path.c_str(), O_WRONLY | O_NONBLOCK, 3, 1000), PUB_ERR_NONE);
    EXPECT_GT(fd, 0);
    EXPECT_EQ(fcntl(fd, F_GETFL) & (O_ACCMODE | O_NONBLOCK), O_WRONLY | O_NONBLOCK);
    EXPECT_EQ(fcntl(fd, F_GETFD), FD_CLOEXEC);
    close(fd);
    lines_t expected_list = open_begin(3, path);
    expected_list.push_back("open device \"" + path + "\" successfully");
    EXPECT_EQ(capture.texts(), expected_list);
}

TEST(open_device, pauses_after_every_failure)
{
    const temp_folder_c dir;
    const std::string path = dir.path("none");
    int fd = -5;
    const log_capture_c capture;
    const clock_t_c::time_point start = clock_t_c::now();
    EXPECT_EQ(pub_util_try_to_open_device(&fd, path.c_str(), O_RDWR, 3, 500), PUB_ERR_FILE);
    EXPECT_GE(elapsed_ms(start), 1500);
    EXPECT_EQ(fd, -5);
    lines_t expected_list = open_begin(3, path);
    add_open_failure(&expected_list, path, ENOENT);
    expected_list.push_back(try_line(1, 3, path));
    add_open_failure(&expected_list, path, ENOENT);
    expected_list.push_back(try_line(2, 3, path));
    add_open_failure(&expected_list, path, ENOENT);
    add_open_failure(&expected_list, path, ENOENT);
    EXPECT_EQ(without_line_numbers(capture), expected_list);
}

TEST(open_device, no_attempts_make_one)
{
    const temp_folder_c dir;
    write_whole_file(dir.path("file"), "");
    const std::string path = dir.path("file/below");
    for (const int attempts : {0, 1, -1}) {
        int fd = -5;
        const log_capture_c capture;
        EXPECT_EQ(pub_util_try_to_open_device(&fd, path.c_str(), O_RDWR, attempts, 0), PUB_ERR_FILE);
        lines_t expected_list = open_begin(attempts, path);
        add_open_failure(&expected_list, path, ENOTDIR);
        add_open_failure(&expected_list, path, ENOTDIR);
        EXPECT_EQ(without_line_numbers(capture), expected_list);
    }
}

TEST(open_device, no_attempts_open_what_is_there)
{
    int fd = -5;
    EXPECT_EQ(pub_util_try_to_open_device(&fd, "/dev/null", O_RDWR, 0, -1), PUB_ERR_NONE);
    EXPECT_GT(fd, 0);
    close(fd);
}

TEST(open_device, device_that_appears_in_time)
{
    const temp_folder_c dir;
    const std::string path = dir.path("late");
    std::thread maker([&path] {
        std::this_thread::sleep_for(std::chrono::milliseconds(60));
        write_whole_file(path, "");
    });
    int fd = -5;
    const log_capture_c capture;
    EXPECT_EQ(pub_util_try_to_open_device(&fd, path.c_str(), O_RDWR, 1000, 20), PUB_ERR_NONE);
    maker.join();
    EXPECT_GT(fd, 0);
    close(fd);
    EXPECT_TRUE(capture.has(try_line(1, 1000, path)));
    EXPECT_EQ(capture.texts().back(), "open device \"" + path + "\" successfully");
}

TEST(open_device, descriptor_0_counts_as_failure)
{
    const child_run_st run = run_in_child([] {
        close(STDIN_FILENO);
        errno = 0;
        int fd = -5;
        const int status = pub_util_try_to_open_device(&fd, "/dev/null", O_RDWR, 2, 0);
        return status == PUB_ERR_NONE ? fd : status;
    });
    EXPECT_GT(run.m_result, 0);
    lines_t expected_list = open_begin(2, "/dev/null");
    add_open_failure(&expected_list, "/dev/null", 0);
    expected_list.push_back(try_line(1, 2, "/dev/null"));
    expected_list.push_back("open device \"/dev/null\" successfully");
    EXPECT_EQ(run.m_text_list, expected_list);
}

TEST(open_device, port_does_not_become_the_controlling_terminal)
{
    const serial_port_c port;
    const std::string name = port.name();
    const child_run_st run = run_in_child([&name] {
        setsid();
        int fd = -1;
        pub_util_try_to_open_device(&fd, name.c_str(), O_RDWR, 1, 0);
        return fd > 0 && open("/dev/tty", O_RDWR) < 0 ? errno : 0;
    });
    EXPECT_EQ(run.m_result, ENXIO);
}

TEST(open_device, absent_and_empty_arguments)
{
    int fd = -5;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_try_to_open_device(nullptr, "/dev/null", O_RDWR, 1, 0), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_try_to_open_device(&fd, nullptr, O_RDWR, 1, 0), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_try_to_open_device(&fd, "", O_RDWR, 1, 0), PUB_ERR_PARAM);
    EXPECT_EQ(fd, -5);
    lines_t expected_list;
    for (const char *flags : {"1, 0, 0", "0, 1, 0", "0, 0, 1"}) {
        expected_list.insert(expected_list.end(),
                             {OPEN_DEVICE + "()", util_error(OPEN_DEVICE, -101, 0), flags});
    }
    EXPECT_EQ(without_line_numbers(capture), expected_list);
}

struct speed_case_st
{
    int32_t m_request;
    speed_t m_speed;
    std::string m_name;
};

/* How the name of a test shows its case. */
static void PrintTo(const speed_case_st &speed_case, std::ostream *stream_ptr)
{
    *stream_ptr << speed_case.m_request;
}

class serial_speed : public testing::TestWithParam<speed_case_st> {};

TEST_P(serial_speed, follows_the_table)
{
    const serial_port_c port;
    const log_capture_c capture;
    EXPECT_EQ(pub_util_set_serial_dev_attr(port.fd(), GetParam().m_request), PUB_ERR_NONE);
    const termios attr = port.attributes();
    EXPECT_EQ(cfgetospeed(&attr), GetParam().m_speed);
    EXPECT_EQ(cfgetispeed(&attr), GetParam().m_speed);
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre(SERIAL_ATTR + "()", "convert speed " +
                                                             std::to_string(GetParam().m_request) + " -> " +
                                                             GetParam().m_name));
}

INSTANTIATE_TEST_SUITE_P(
    requests, serial_speed,
    testing::Values(speed_case_st{0, B115200, "B115200"}, speed_case_st{9600, B115200, "B115200"},
                    speed_case_st{-1, B115200, "B115200"}, speed_case_st{115200, B115200, "B115200"},
                    speed_case_st{115201, B230400, "B230400"}, speed_case_st{230400, B230400, "B230400"},
                    speed_case_st{230401, B460800, "B460800"}, speed_case_st{460800, B460800, "B460800"},
                    speed_case_st{460801, B921600, "B921600"}, speed_case_st{3000000, B921600, "B921600"},
                    speed_case_st{INT32_MAX, B921600, "B921600"}));

TEST(serial_attr, line_is_raw_with_flow_control_and_the_rest_stays)
{
    const serial_port_c port;
    termios before = port.attributes();
    before.c_iflag |= IXON | ICRNL | INLCR | ISTRIP | IXOFF | BRKINT;
    before.c_oflag |= OPOST | ONLCR | OCRNL;
    before.c_lflag |= ICANON | ECHO | ECHOE | ISIG | IEXTEN | NOFLSH;
    before.c_cflag |= CSTOPB | CLOCAL;
    before.c_cflag &= ~static_cast<tcflag_t>(CRTSCTS | HUPCL);
    before.c_cc[VMIN] = 7;
    before.c_cc[VTIME] = 3;
    ASSERT_EQ(tcsetattr(port.fd(), TCSANOW, &before), 0);
    before = port.attributes();

    EXPECT_EQ(pub_util_set_serial_dev_attr(port.fd(), 115200), PUB_ERR_NONE);
    const termios after = port.attributes();
    EXPECT_EQ(after.c_iflag, before.c_iflag & ~static_cast<tcflag_t>(IXON | ICRNL | INLCR));
    EXPECT_EQ(after.c_oflag, before.c_oflag & ~static_cast<tcflag_t>(ONLCR | OCRNL));
    EXPECT_EQ(after.c_lflag, 0U);
    const tcflag_t speed_bits = CBAUD | CBAUDEX;
    EXPECT_EQ(after.c_cflag & ~speed_bits, (before.c_cflag & ~speed_bits) | CRTSCTS);
    EXPECT_EQ(memcmp(after.c_cc, before.c_cc, sizeof(after.c_cc)), 0);
}

TEST(serial_attr, negative_descriptor)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_set_serial_dev_attr(-1, 115200), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(SERIAL_ATTR + "()", util_error(SERIAL_ATTR, -101, 0)));
}

TEST(serial_attr, no_terminal)
{
    const int fd = open("/dev/null", O_RDWR);
    const log_capture_c capture;
    EXPECT_EQ(pub_util_set_serial_dev_attr(fd, 230400), PUB_ERR_SYS_CALL);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(SERIAL_ATTR + "()", sys_call_line("tcgetattr", ENOTTY),
                                     util_error(SERIAL_ATTR, -1, ENOTTY), "convert speed 230400 -> B230400"));
    close(fd);
}

TEST(serial_attr, descriptor_0_is_one)
{
    const int fd = open("/dev/null", O_RDWR);
    const descriptor_swap_c swap(0, fd);
    EXPECT_EQ(pub_util_set_serial_dev_attr(0, 230400), PUB_ERR_SYS_CALL);
    close(fd);
}

TEST(serial_attr, attributes_that_cannot_be_written)
{
    const serial_port_c port;
    const child_run_st run = run_in_child([&port] { return pub_util_set_serial_dev_attr(port.fd(), 921600); },
                                          {SYS_ioctl, EIO, true, TCSETS});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_SYS_CALL);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre(SERIAL_ATTR + "()", "convert speed 921600 -> B921600",
                                     sys_call_line("tcsetattr", EIO), util_error(SERIAL_ATTR, -1, EIO)));
}

TEST(fd_mode, switches_only_blocking)
{
    const temp_folder_c dir;
    const int file = open(dir.path("file").c_str(), O_RDWR | O_CREAT | O_APPEND, 0600);
    ASSERT_GE(file, 0);
    const std::string fd = std::to_string(file);
    const log_capture_c capture;
    EXPECT_EQ(pub_util_set_fd_mode(file, 1), PUB_ERR_NONE);
    EXPECT_EQ(fcntl(file, F_GETFL) & (O_NONBLOCK | O_APPEND), O_NONBLOCK | O_APPEND);
    EXPECT_EQ(pub_util_set_fd_mode(file, 0), PUB_ERR_NONE);
    EXPECT_EQ(fcntl(file, F_GETFL) & (O_NONBLOCK | O_APPEND), O_APPEND);
    EXPECT_EQ(pub_util_set_fd_mode(file, 255), PUB_ERR_NONE);
    EXPECT_EQ(fcntl(file, F_GETFL) & (O_NONBLOCK | O_APPEND), O_NONBLOCK | O_APPEND);
    const std::string begin = FD_MODE + " fd[" + fd + "] is_nonblock_mode[";
    const std::string end = FD_MODE + " return ERR_NONE";
    EXPECT_THAT(capture.texts(),
                testing::ElementsAre(FD_MODE + "()", begin + "1]", end, FD_MODE + "()", begin + "0]", end,
                                     FD_MODE + "()", begin + "255]", end));
    close(file);
}

/* A pipe's end for reading has no flag at all. */
TEST(fd_mode, descriptor_0_without_flags_is_one)
{
    int fd_a[2];
    ASSERT_EQ(pipe(fd_a), 0);
    const descriptor_swap_c swap(0, fd_a[0]);
    EXPECT_EQ(pub_util_set_fd_mode(0, 1), PUB_ERR_NONE);
    EXPECT_EQ(fcntl(0, F_GETFL), O_NONBLOCK);
    EXPECT_EQ(pub_util_set_fd_mode(0, 0), PUB_ERR_NONE);
    EXPECT_EQ(fcntl(0, F_GETFL), 0);
    close(fd_a[0]);
    close(fd_a[1]);
}

TEST(fd_mode, negative_descriptor)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_set_fd_mode(-1, 1), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(FD_MODE + "()", util_error(FD_MODE, -101, 0)));
}

TEST(fd_mode, closed_descriptor)
{
    const log_capture_c capture;
    EXPECT_EQ(pub_util_set_fd_mode(1000000, 1), PUB_ERR_FILE);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(FD_MODE + "()", FD_MODE + " fd[1000000] is_nonblock_mode[1]",
                                     sys_call_line("fcntl", EBADF), util_error(FD_MODE, -118, EBADF)));
}

TEST(fd_mode, flags_that_cannot_be_set)
{
    const child_run_st run = run_in_child([] { return pub_util_set_fd_mode(STDERR_FILENO, 0); },
                                          {FCNTL_CALL, EPERM, true, F_SETFL});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_FILE);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre(FD_MODE + "()", FD_MODE + " fd[2] is_nonblock_mode[0]",
                                     sys_call_line("fcntl", EPERM), util_error(FD_MODE, -118, EPERM)));
}
