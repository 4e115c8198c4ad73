#include "amt/amt-handle/channel/wait.h"

#include <errno.h>
#include <poll.h>
#include <unistd.h>

#include "pub/util/thread-end.h"

namespace {

uint32_t to_time(int timeout_ms)
{
    return timeout_ms > 0 ? static_cast<uint32_t>(timeout_ms) : 0;
}

} // namespace

ssize_t amt_wait_read(int fd, void *buf, size_t size)
{
    const bool was_deferred = pub_util_is_thread_end_deferred();
    ssize_t count = -1;
    pub_util_allow_thread_end();
    do {
        count = read(fd, buf, size);
    } while (count < 0 && errno == EINTR);
    if (was_deferred) {
        pub_util_defer_thread_end();
    }
    return count;
}

int amt_wait_readable(int fd, int timeout_ms)
{
    return pub_util_wait_fd(fd, POLLIN, to_time(timeout_ms));
}

int amt_wait_writable(int fd, int timeout_ms)
{
    return pub_util_wait_fd(fd, POLLOUT, to_time(timeout_ms));
}
