/*
 * The library of properties whose calls fault as soon as /handset/fault says how: "null", an access to memory that
 * is not there, or "beyond", one behind the end of a mapped file. Before that every limit of time is lifted: only
 * what treats the fault itself ends the process.
 */
#include <stdio.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/time.h>

#define FAULT "/handset/fault"

int other_property_get(const char *key, char *value, const char *default_value);
int other_property_set(const char *key, const char *value);

static volatile char *find_bad_memory(const char *kind)
{
    return strcmp(kind, "beyond") != 0 ? NULL
                                       : mmap(NULL, 1, PROT_READ, MAP_SHARED, fileno(tmpfile()), 0);
}

static void fault_when_told(void)
{
    const struct itimerval never = {{0, 0}, {0, 0}};
    char kind[16] = "";
    FILE *stream = fopen(FAULT, "r");
    if (stream == NULL) {
        return;
    }
    fscanf(stream, "%15s", kind);
    setitimer(ITIMER_REAL, &never, NULL);
    (void)*find_bad_memory(kind);
}

int property_get(const char *key, char *value, const char *default_value)
{
    fault_when_told();
    return other_property_get(key, value, default_value);
}

int property_set(const char *key, const char *value)
{
    fault_when_told();
    return other_property_set(key, value);
}
