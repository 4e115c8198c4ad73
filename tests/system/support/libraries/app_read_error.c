/*
 * The library of properties in a system in which a pseudo-terminal's master fails: while /handset/app-read-error is
 * there, what is read from it is lost and the read says that there is no such device.
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/types.h>
#include <unistd.h>

int other_property_get(const char *key, char *value, const char *default_value);

static int is_master(int descriptor)
{
    char path[48];
    char target[64] = "";
    snprintf(path, sizeof(path), "/proc/self/fd/%d", descriptor);
    return readlink(path, target, sizeof(target) - 1) > 0 && strstr(target, "ptmx") != NULL;
}

ssize_t read(int descriptor, void *buffer, size_t size)
{
    ssize_t (*other)(int, void *, size_t) = dlsym(RTLD_NEXT, "read");
    const ssize_t count = other(descriptor, buffer, size);
    if (count <= 0 || access("/handset/app-read-error", F_OK) != 0 || !is_master(descriptor)) {
        return count;
    }
    errno = ENODEV;
    return -1;
}

int property_get(const char *key, char *value, const char *default_value)
{
    return other_property_get(key, value, default_value);
}
