#include <errno.h>
#include <fcntl.h>
#include <linux/netlink.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/select.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

/*
 * Tries one thing that an emulator may not be able to do: `emulation-limits NAME`. Ends with 0 when it can be
 * done, with 1 when it cannot, with 2 when the try itself failed.
 */
namespace {

constexpr int CAN = 0;
constexpr int CANNOT = 1;
constexpr int FAILED = 2;

/* A program for the same machine is started, this one with a name that it does not know. */
int try_start(const char *program)
{
    const pid_t child = fork();
    if (child == 0) {
        execl(program, program, "started", nullptr);
        _exit(CANNOT);
    }
    int status = 0;
    if (child < 0 || waitpid(child, &status, 0) != child || !WIFEXITED(status)) {
        return FAILED;
    }
    return WEXITSTATUS(status) == FAILED ? CAN : CANNOT;
}

/* A terminal keeps the speed that it is given. */
int try_speed(const char *)
{
    const int fd = posix_openpt(O_RDWR | O_NOCTTY);
    termios settings = {};
    if (fd < 0 || tcgetattr(fd, &settings) != 0 || cfsetospeed(&settings, B921600) != 0) {
        return FAILED;
    }
    termios kept = {};
    return tcsetattr(fd, TCSANOW, &settings) == 0 && tcgetattr(fd, &kept) == 0 &&
                   cfgetospeed(&kept) == B921600
               ? CAN
               : CANNOT;
}

void do_nothing(int) {}

/* A select() of an hour is interrupted at once, and says that less than the hour is left. */
int try_select(const char *)
{
    struct sigaction action = {};
    action.sa_handler = do_nothing;
    itimerval soon = {};
    soon.it_value.tv_usec = 100000;
    timeval left = {};
    left.tv_sec = 3600;
    if (sigaction(SIGALRM, &action, nullptr) != 0 || setitimer(ITIMER_REAL, &soon, nullptr) != 0 ||
        select(0, nullptr, nullptr, nullptr, &left) != -1 || errno != EINTR)
    {
        return FAILED;
    }
    return left.tv_sec < 3600 ? CAN : CANNOT;
}

int try_netlink(const char *)
{
    return socket(AF_NETLINK, SOCK_RAW, NETLINK_GENERIC) >= 0 ? CAN : CANNOT;
}

/* A process that has only been forked shows the command line of the one that it was forked from. */
int try_neighbour(const char *program)
{
    const pid_t child = fork();
    if (child == 0) {
        pause();
        _exit(FAILED);
    }
    char path_a[64];
    snprintf(path_a, sizeof(path_a), "/proc/%d/cmdline", static_cast<int>(child));
    const int fd = child < 0 ? -1 : open(path_a, O_RDONLY | O_CLOEXEC);
    char text_a[4096] = {};
    const ssize_t got = fd < 0 ? -1 : read(fd, text_a, sizeof(text_a) - 1);
    if (child > 0) {
        kill(child, SIGKILL);
        waitpid(child, nullptr, 0);
    }
    if (got <= 0) {
        return FAILED;
    }
    return strcmp(text_a, program) == 0 ? CAN : CANNOT;
}

struct probe_st
{
    const char *m_name_ptr;
    int (*m_try_ptr)(const char *program);
};

constexpr probe_st PROBE_A[] = {{"start", try_start},
                                {"speed", try_speed},
                                {"select", try_select},
                                {"netlink", try_netlink},
                                {"neighbour", try_neighbour}};

} // namespace

int main(int argc, char **argv)
{
    for (const probe_st &probe : PROBE_A) {
        if (argc == 2 && strcmp(argv[1], probe.m_name_ptr) == 0) {
            const int status = probe.m_try_ptr(argv[0]);
            if (status == FAILED) {
                fprintf(stderr, "%s: %s\n", argv[1], strerror(errno));
            }
            return status;
        }
    }
    return FAILED;
}
