/*
 * The library of properties in a system that has one thread left to give, which the start itself runs on: every
 * later creation fails. Properties are the other library's, which lies beside it.
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>

#define OTHER "/system/lib/libcutils-other.so"

static void *find(const char *name)
{
    return dlsym(dlopen(OTHER, RTLD_NOW), name);
}

int pthread_create(void *thread, const void *attributes, void *(*body)(void *), void *argument)
{
    static int given = 0;
    int (*create)(void *, const void *, void *(*)(void *), void *) = dlsym(RTLD_NEXT, "pthread_create");
    return given++ == 0 ? create(thread, attributes, body, argument) : EAGAIN;
}

int property_get(const char *key, char *value, const char *default_value)
{
    int (*get)(const char *, char *, const char *) = find("property_get");
    return get(key, value, default_value);
}

int property_set(const char *key, const char *value)
{
    int (*set)(const char *, const char *) = find("property_set");
    return set(key, value);
}
