/*
 * The library of properties on a busy machine: before each wait for signals the processor is somebody else's for
 * a while, and as long as a test wishes. The caller is ready to run meanwhile, as one that has been displaced is.
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <fcntl.h>
#include <time.h>
#include <unistd.h>

#define DISPLACED_NS 500000000LL
#define WISH "/tmp/displaced"
#define BEGUN "/tmp/displaced-now"

static long long now_ns(void)
{
    struct timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * 1000000000LL + now.tv_nsec;
}

int sigtimedwait(const void *set, void *info, const struct timespec *timeout)
{
    int (*wait)(const void *, void *, const struct timespec *) = dlsym(RTLD_NEXT, "sigtimedwait");
    close(open(BEGUN, O_CREAT | O_WRONLY | O_CLOEXEC, 0644));
    for (long long end = now_ns() + DISPLACED_NS; now_ns() < end || access(WISH, F_OK) == 0;) {
    }
    return wait(set, info, timeout);
}
