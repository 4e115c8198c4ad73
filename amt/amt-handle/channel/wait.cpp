#include "amt/amt-handle/channel/wait.h"

#include <errno.h>
#include <sys/select.h>
#include <unistd.h>

#include "pub/util/thread-end.h"

namespace {

/* Runs the wait with the thread's end allowed, if it was deferred. */
template <typename wait_func> auto wait_open_to_end(wait_func wait)
{
    const bool is_worker = pub_util_is_thread_end_deferred();
    if (is_worker) {
        pub_util_allow_thread_end();
    }
    const auto result = wait();
    const int wait_errno = errno;
    if (is_worker) {
        pub_util_defer_thread_end();
    }
    errno = wait_errno;
    return result;
}

int wait_for(int fd, bool is_to_write, int timeout_ms)
{
    if (fd < 0 || fd >= FD_SETSIZE) {
        errno = EBADF;
        return -1;
    }
    timeval left = {timeout_ms / 1000, (timeout_ms % 1000) * 1000L};
    for (;;) {
        fd_set fds;
        FD_ZERO(&fds);
        FD_SET(fd, &fds);
        const int ready = wait_open_to_end([&] {
            return select(fd + 1, is_to_write ? nullptr : &fds, is_to_write ? &fds : nullptr, nullptr, &left);
        });
        if (ready >= 0 || errno != EINTR) {
            return ready;
        }
        pub_util_sleep_ms(0); /* a sanitizer holds the signal's handler back until such a call */
    }
}

} // namespace

ssize_t amt_wait_read(int fd, void *buf, size_t size)
{
    ssize_t count = -1;
    do {
        count = wait_open_to_end([=] { return read(fd, buf, size); });
    } while (count < 0 && errno == EINTR);
    return count;
}

int amt_wait_readable(int fd, int timeout_ms)
{
    return wait_for(fd, false, timeout_ms);
}

int amt_wait_writable(int fd, int timeout_ms)
{
    return wait_for(fd, true, timeout_ms);
}
