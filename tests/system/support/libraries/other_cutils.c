/*
 * Built into each library in the place of the one of properties: what that does not want to do itself it has the
 * ordinary one do, which lies beside it.
 */
#include <dlfcn.h>

#define OTHER "/system/lib/libcutils-other.so"

static void *find(const char *name)
{
    return dlsym(dlopen(OTHER, RTLD_NOW), name);
}

int other_property_get(const char *key, char *value, const char *default_value)
{
    int (*get)(const char *, char *, const char *) = find("property_get");
    return get(key, value, default_value);
}

/* Weak: a library that replaces other calls only need not have its own. */
__attribute__((weak)) int property_get(const char *key, char *value, const char *default_value)
{
    return other_property_get(key, value, default_value);
}

int other_property_set(const char *key, const char *value)
{
    int (*set)(const char *, const char *) = find("property_set");
    return set(key, value);
}

__attribute__((weak)) int property_set(const char *key, const char *value)
{
    return other_property_set(key, value);
}
