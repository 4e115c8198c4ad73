#include "pub/log/print.h"

#include <errno.h>
#include <stdarg.h>
#include <stddef.h>
#include <stdio.h>
#include <unistd.h>

namespace {

/* With the terminating zero: room for a page of text behind a title. */
constexpr size_t TEXT_SIZE = 4608;

void write_whole(const char *text, size_t length)
{
    while (length > 0) {
        const ssize_t written = write(STDOUT_FILENO, text, length);
        if (written < 0 && errno == EINTR) {
            continue;
        }
        if (written <= 0) {
            return;
        }
        text += written;
        length -= static_cast<size_t>(written);
    }
}

} // namespace

void pub_print(const char *format, ...)
{
    const int saved_errno = errno;
    char text_a[TEXT_SIZE];
    va_list args;
    va_start(args, format);
    const int length = vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    if (length > 0) {
        const size_t wanted = static_cast<size_t>(length);
        write_whole(text_a, wanted < sizeof(text_a) ? wanted : sizeof(text_a) - 1);
    }
    errno = saved_errno;
}
