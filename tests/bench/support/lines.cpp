#include "tests/bench/support/lines.h"

#include <algorithm>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

namespace {

constexpr int ANSWER_TIMEOUT_MS = 5000;

} // namespace

void die(const char *what)
{
    fprintf(stderr, "link-bench: %s: %s\n", what, strerror(errno));
    exit(1);
}

void write_whole(int fd, const char *data, size_t length)
{
    while (length > 0) {
        const ssize_t written = write(fd, data, length);
        if (written <= 0) {
            die("write");
        }
        data += written;
        length -= static_cast<size_t>(written);
    }
}

void write_whole(int fd, const std::string &data)
{
    write_whole(fd, data.data(), data.size());
}

void read_whole(int fd, size_t length)
{
    char buf_a[65536];
    while (length > 0) {
        pollfd poll_fd = {fd, POLLIN, 0};
        if (poll(&poll_fd, 1, ANSWER_TIMEOUT_MS) != 1) {
            errno = ETIMEDOUT;
            die("no answer");
        }
        const ssize_t count = read(fd, buf_a, std::min(sizeof(buf_a), length));
        if (count <= 0) {
            die("read");
        }
        length -= static_cast<size_t>(count);
    }
}

void make_blocking(int fd)
{
    fcntl(fd, F_SETFL, fcntl(fd, F_GETFL) & ~O_NONBLOCK);
}

int open_pty(std::string *path_ptr)
{
    const int master = posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
    if (master < 0 || grantpt(master) != 0 || unlockpt(master) != 0) {
        die("pseudo-terminal");
    }
    *path_ptr = ptsname(master);
    termios attr = {};
    tcgetattr(master, &attr);
    cfmakeraw(&attr);
    tcsetattr(master, TCSANOW, &attr);
    return master;
}

int open_slave(const std::string &path)
{
    const int slave = open(path.c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    if (slave < 0) {
        die("pseudo-terminal's slave");
    }
    return slave;
}

pid_t fork_companion()
{
    const pid_t pid = fork();
    if (pid < 0) {
        die("fork");
    }
    if (pid == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
    }
    return pid;
}

void end_companion(pid_t pid)
{
    kill(pid, SIGKILL);
    waitpid(pid, nullptr, 0);
}
