/*
 * The library of properties in which some cannot be read: those whose names /handset/unreadable.txt lists, a line
 * each, give neither a value nor the default. Everything else is the other library's, which lies beside it.
 */
#include <dlfcn.h>
#include <stdio.h>
#include <string.h>

#define OTHER "/system/lib/libcutils-other.so"

static int is_unreadable(const char *key)
{
    char line[128];
    int found = 0;
    FILE *stream = fopen("/handset/unreadable.txt", "r");
    while (stream != NULL && !found && fgets(line, sizeof(line), stream) != NULL) {
        line[strcspn(line, "\n")] = '\0';
        found = strcmp(line, key) == 0;
    }
    if (stream != NULL) {
        fclose(stream);
    }
    return found;
}

static void *find(const char *name)
{
    return dlsym(dlopen(OTHER, RTLD_NOW), name);
}

int property_get(const char *key, char *value, const char *default_value)
{
    int (*get)(const char *, char *, const char *) = find("property_get");
    if (is_unreadable(key)) {
        value[0] = '\0';
        return 0;
    }
    return get(key, value, default_value);
}

int property_set(const char *key, const char *value)
{
    int (*set)(const char *, const char *) = find("property_set");
    return set(key, value);
}
