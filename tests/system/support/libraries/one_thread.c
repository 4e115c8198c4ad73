/*
 * The library of properties in a system that has one thread left to give, which the start itself runs on: every
 * later creation fails.
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>

int pthread_create(void *thread, const void *attributes, void *(*body)(void *), void *argument)
{
    static int given = 0;
    int (*create)(void *, const void *, void *(*)(void *), void *) = dlsym(RTLD_NEXT, "pthread_create");
    return given++ == 0 ? create(thread, attributes, body, argument) : EAGAIN;
}
