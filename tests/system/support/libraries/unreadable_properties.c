/*
 * The library of properties in which some cannot be read: those whose names /handset/unreadable.txt lists, a line
 * each, give neither a value nor the default.
 */
#include <stdio.h>
#include <string.h>

int other_property_get(const char *key, char *value, const char *default_value);

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

int property_get(const char *key, char *value, const char *default_value)
{
    if (is_unreadable(key)) {
        value[0] = '\0';
        return 0;
    }
    return other_property_get(key, value, default_value);
}
