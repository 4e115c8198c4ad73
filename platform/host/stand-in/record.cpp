#include "platform/host/stand-in/stand-in.h"

#include <errno.h>
#include <fcntl.h>
#include <stdarg.h>
#include <stdio.h>
#include <unistd.h>

void stand_in_record(const char *format, ...)
{
    const char *path = stand_in_setting(STAND_IN_CALLS);
    if (path == nullptr) {
        return;
    }
    const int saved_errno = errno;
    char line_a[1024];
    constexpr uint32_t room = sizeof(line_a) - 1;
    va_list args;
    va_start(args, format);
    const int wanted = vsnprintf(line_a, room, format, args);
    va_end(args);

    uint32_t length = wanted < 0 ? 0 : static_cast<uint32_t>(wanted);
    length = stand_in_escape(line_a, length < room ? length : room - 1, room);
    line_a[length++] = '\n';

    const int fd = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0666);
    if (fd >= 0) {
        const ssize_t written = write(fd, line_a, length);
        (void)written;
        close(fd);
    }
    errno = saved_errno;
}
