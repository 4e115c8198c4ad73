/*
 * The library of properties in a system in which single calls fail: each while its file in /handset/fail is there.
 * memory: what is as large as the picture. inflate: every piece. timer: its id is -1, as a system may number it.
 * station: a text that begins with a line called REFUSED cannot be written.
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <stddef.h>
#include <string.h>
#include <sys/types.h>
#include <unistd.h>

#define PICTURE_SIZE (346 * 390 * 2)
#define STREAM_DAMAGED (-3)
#define REFUSED "\r\nREFUSED"

int other_property_get(const char *key, char *value, const char *default_value);
void *__libc_malloc(size_t size);

static int is_to_fail(const char *path)
{
    const int saved_errno = errno;
    const int is_there = access(path, F_OK) == 0;
    errno = saved_errno;
    return is_there;
}

void *malloc(size_t size)
{
    if (size == PICTURE_SIZE && is_to_fail("/handset/fail/memory")) {
        errno = ENOMEM;
        return NULL;
    }
    return __libc_malloc(size);
}

int inflate(void *stream, int flush)
{
    int (*other)(void *, int) = dlsym(RTLD_NEXT, "inflate");
    return is_to_fail("/handset/fail/inflate") ? STREAM_DAMAGED : other(stream, flush);
}

int timer_create(int clock, void *event, void **timer)
{
    int (*other)(int, void *, void **) = dlsym(RTLD_NEXT, "timer_create");
    if (!is_to_fail("/handset/fail/timer")) {
        return other(clock, event, timer);
    }
    *timer = (void *)-1L;
    return 0;
}

ssize_t write(int descriptor, const void *data, size_t size)
{
    ssize_t (*other)(int, const void *, size_t) = dlsym(RTLD_NEXT, "write");
    if (size >= strlen(REFUSED) && memcmp(data, REFUSED, strlen(REFUSED)) == 0 &&
        is_to_fail("/handset/fail/station"))
    {
        errno = ENOSPC;
        return -1;
    }
    return other(descriptor, data, size);
}

int property_get(const char *key, char *value, const char *default_value)
{
    return other_property_get(key, value, default_value);
}
