/*
 * What ThreadSanitizer needs beside a program's own code; linked into the programs of its build only.
 */

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

/*
 * Not to be reported: the end of the process waits a bounded time for a worker that is busy, and then closes its
 * line under it. A shell command may take for ever, and the process is gone a moment later.
 */
extern "C" const char *__tsan_default_suppressions();

extern "C" const char *__tsan_default_suppressions()
{
    return "race:amt_handle_close_fd\n"
           "race:pub_pty_close\n";
}

/*
 * The sanitizer runs a signal's handler at once only in calls that it knows to wait, and read is none of them: a
 * handler kept back there would wait as long as the line is silent. poll is one, and read then finds something.
 * What it finds of a terminal that was hung up meanwhile is no end of data, but the error of a read that waited.
 */
namespace {

bool is_terminal_hung_up(const pollfd &polled)
{
    struct stat status = {};
    return (polled.revents & POLLHUP) != 0 && fstat(polled.fd, &status) == 0 && S_ISCHR(status.st_mode);
}

} // namespace

extern "C" ssize_t __real_read(int fd, void *buf, size_t size);
extern "C" ssize_t __wrap_read(int fd, void *buf, size_t size);

extern "C" ssize_t __wrap_read(int fd, void *buf, size_t size)
{
    pollfd polled = {fd, POLLIN, 0};
    const int flags = fcntl(fd, F_GETFL);
    if (flags >= 0 && (flags & O_NONBLOCK) == 0 && poll(&polled, 1, -1) < 0) {
        return -1;
    }
    const ssize_t count = __real_read(fd, buf, size);
    if (count == 0 && is_terminal_hung_up(polled)) {
        errno = EIO;
        return -1;
    }
    return count;
}
