#include "tests/unit/pub/support/child-process.h"

#include <errno.h>
#include <fcntl.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <signal.h>
#include <stddef.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/unit/support/log-capture.h"

namespace {

constexpr int CHILD_DONE = 0;
constexpr int CHILD_NOT_POSSIBLE = 77;

bool refuse(const failing_call_st &call)
{
    const uint32_t verdict = SECCOMP_RET_ERRNO | static_cast<uint32_t>(call.m_errno);
    const uint8_t request_skip = call.m_is_one_request ? 0 : 2;
    sock_filter filter_a[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<uint32_t>(call.m_number), 0, 4),
        BPF_JUMP(BPF_JMP | BPF_JA, request_skip, 0, 0),
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, args[1])),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, call.m_request, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, verdict),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    const sock_fprog program = {sizeof(filter_a) / sizeof(filter_a[0]), filter_a};
    return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
           prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

[[noreturn]] void be_child(int pipe_fd, const std::function<int()> &body, const failing_call_st &failing_call)
{
    const log_capture_c capture;
    if (failing_call.m_number != 0 && !refuse(failing_call)) {
        _exit(CHILD_NOT_POSSIBLE);
    }
    std::string report = std::to_string(body());
    for (const std::string &text : without_line_numbers(capture)) {
        report += '\0' + text;
    }
    const ssize_t written = write(pipe_fd, report.data(), report.size());
    _exit(written == static_cast<ssize_t>(report.size()) ? CHILD_DONE : 1);
}

std::string read_all(int fd)
{
    std::string content;
    char buf_a[4096];
    for (ssize_t count = read(fd, buf_a, sizeof(buf_a)); count > 0; count = read(fd, buf_a, sizeof(buf_a))) {
        content.append(buf_a, static_cast<size_t>(count));
    }
    return content;
}

bool has_command_line(pid_t pid)
{
    const std::string path = "/proc/" + std::to_string(pid) + "/cmdline";
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    const std::string line = read_all(fd);
    close(fd);
    return !line.empty();
}

} // namespace

child_run_st run_in_child(const std::function<int()> &body, const failing_call_st &failing_call)
{
    int pipe_a[2];
    EXPECT_EQ(pipe(pipe_a), 0);
    const pid_t pid = fork();
    if (pid == 0) {
        close(pipe_a[0]);
        be_child(pipe_a[1], body, failing_call);
    }
    close(pipe_a[1]);
    const std::string report = read_all(pipe_a[0]);
    close(pipe_a[0]);
    int status = 0;
    EXPECT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_TRUE(WIFEXITED(status)) << "the child died of signal " << WTERMSIG(status);
    const int exit_status = WEXITSTATUS(status);
    EXPECT_TRUE(exit_status == CHILD_DONE || exit_status == CHILD_NOT_POSSIBLE) << exit_status;

    child_run_st run = {WIFEXITED(status) && exit_status == CHILD_DONE, 0, {}};
    if (run.m_is_complete) {
        run.m_result = std::stoi(report);
        for (size_t at = report.find('\0'); at != std::string::npos;) {
            const size_t end = report.find('\0', at + 1);
            run.m_text_list.push_back(report.substr(at + 1, end == std::string::npos ? end : end - at - 1));
            at = end;
        }
    }
    return run;
}

other_program_c::other_program_c(const std::string &program, bool is_exited)
{
    int pipe_a[2];
    EXPECT_EQ(pipe2(pipe_a, O_CLOEXEC), 0);
    m_pid = fork();
    if (m_pid == 0) {
        execl("/bin/sleep", program.c_str(), is_exited ? "0" : "60", static_cast<char *>(nullptr));
        _exit(1);
    }
    close(pipe_a[1]);
    EXPECT_EQ(read_all(pipe_a[0]), ""); /* ends when the new program has taken over */
    close(pipe_a[0]);
    if (is_exited) {
        siginfo_t info = {};
        EXPECT_EQ(waitid(P_PID, static_cast<id_t>(m_pid), &info, WEXITED | WNOWAIT), 0);
        return;
    }
    /* The kernel closes descriptors before it lays out the command line. */
    while (!has_command_line(m_pid)) {
        usleep(1000);
    }
}

other_program_c::~other_program_c()
{
    kill(m_pid, SIGKILL);
    waitpid(m_pid, nullptr, 0);
}

pid_t other_program_c::pid() const
{
    return m_pid;
}
