#include "platform/host/stand-in/stand-in.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

const char *stand_in_setting(const char *variable)
{
    const char *value = getenv(variable);
    return value != nullptr && value[0] != '\0' ? value : nullptr;
}

bool stand_in_path(char *path, const char *variable, const char *name)
{
    const char *directory = stand_in_setting(variable);
    if (directory == nullptr) {
        return false;
    }
    const int length = snprintf(path, STAND_IN_PATH_SIZE, "%s/%s", directory, name);
    return length > 0 && static_cast<uint32_t>(length) < STAND_IN_PATH_SIZE;
}

int32_t stand_in_read_file(const char *path, char *text, uint32_t capacity)
{
    const int fd = open(path, O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return -1;
    }
    uint32_t filled = 0;
    ssize_t got = 0;
    while (filled + 1 < capacity && (got = read(fd, text + filled, capacity - 1 - filled)) > 0) {
        filled += static_cast<uint32_t>(got);
    }
    close(fd);
    text[filled] = '\0';
    return got < 0 ? -1 : static_cast<int32_t>(filled);
}

int32_t stand_in_replace_file(const char *path, const char *text, uint32_t length)
{
    /* The new text's name begins with a dot and holds the thread's id: hidden in the directory, shared with
     * nobody. */
    const char *slash = strrchr(path, '/');
    const int directory_length = slash == nullptr ? 0 : static_cast<int>(slash - path) + 1;
    char fresh_a[STAND_IN_PATH_SIZE + 16];
    snprintf(fresh_a, sizeof(fresh_a), "%.*s.%s.%d", directory_length, path, path + directory_length,
             gettid());

    const int fd = open(fresh_a, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
    if (fd < 0) {
        return -1;
    }
    const bool is_written = write(fd, text, length) == static_cast<ssize_t>(length);
    const bool is_closed = close(fd) == 0;
    if (is_written && is_closed && rename(fresh_a, path) == 0) {
        return 0;
    }
    const int saved_errno = errno;
    unlink(fresh_a);
    errno = saved_errno;
    return -1;
}

uint32_t stand_in_escape(char *text, uint32_t length, uint32_t capacity)
{
    /* Nearly every text has none, and the log asks for each record: memchr is several times faster than a
     * loop. */
    if (memchr(text, '\n', length) == nullptr && memchr(text, '\r', length) == nullptr) {
        return length < capacity ? length : capacity;
    }
    uint32_t breaks = 0;
    for (uint32_t i = 0; i < length; i++) {
        breaks += text[i] == '\n' || text[i] == '\r';
    }
    /* From the end backwards, so that nothing is overwritten before it was moved. */
    const uint32_t escaped_length = length + breaks;
    uint32_t to = escaped_length;
    for (uint32_t from = length; from-- > 0;) {
        const char character = text[from];
        const bool is_break = character == '\n' || character == '\r';
        to -= is_break ? 2 : 1;
        if (is_break && to + 1 < capacity) {
            text[to + 1] = character == '\n' ? 'n' : 'r';
        }
        if (to < capacity) {
            text[to] = is_break ? '\\' : character;
        }
    }
    return escaped_length < capacity ? escaped_length : capacity;
}
