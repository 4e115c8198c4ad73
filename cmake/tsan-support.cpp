/*
 * What ThreadSanitizer needs beside a program's own code; linked into the programs of its build only.
 */

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

/*
 * Not to be reported:
 *
 * - The end of the process waits a bounded time for a worker that is busy, and then closes its line under it. A shell
 *   command may take for ever, and the process is gone a moment later.
 * - A worker ends inside the handler of SIGUSR1, and the C library may free there what threads that ended before it
 *   have left. It ends in a wait only, where it is in nobody's middle.
 */
extern "C" const char *__tsan_default_suppressions();

extern "C" const char *__tsan_default_suppressions()
{
    return "race:amt_handle_close_fd\n"
           "race:pub_pty_close\n"
           "signal:_dl_deallocate_tls\n";
}

/*
 * The sanitizer keeps a signal's handler back until the thread calls one of its interceptors again. A call that the
 * kernel takes up again by itself would keep it back for ever; interrupted, it ends, and the handler runs.
 */
extern "C" int __real_sigaction(int number, const struct sigaction *action_ptr, struct sigaction *old_ptr);
extern "C" int __wrap_sigaction(int number, const struct sigaction *action_ptr, struct sigaction *old_ptr);

extern "C" int __wrap_sigaction(int number, const struct sigaction *action_ptr, struct sigaction *old_ptr)
{
    if (action_ptr == nullptr) {
        return __real_sigaction(number, action_ptr, old_ptr);
    }
    struct sigaction action = *action_ptr;
    action.sa_flags &= ~SA_RESTART;
    return __real_sigaction(number, &action, old_ptr);
}

/*
 * Even so, a signal that comes between two reads is kept back by the second. poll is a call that the sanitizer
 * knows to wait, and runs handlers in at once; read then finds something. What it finds of a terminal that was hung
 * up meanwhile is no end of data, but the error of a read that waited.
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
    const bool is_to_wait = size > 0 && flags >= 0 && (flags & O_NONBLOCK) == 0 && poll(&polled, 1, 0) == 0;
    if (is_to_wait && poll(&polled, 1, -1) < 0) {
        return -1;
    }
    const ssize_t count = __real_read(fd, buf, size);
    if (count == 0 && is_to_wait && is_terminal_hung_up(polled)) {
        errno = EIO;
        return -1;
    }
    return count;
}
