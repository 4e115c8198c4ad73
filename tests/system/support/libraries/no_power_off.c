/* The library of properties in a system whose kernel will not be switched off: every such wish is refused. */
#include <errno.h>

int other_property_get(const char *key, char *value, const char *default_value);

int reboot(int command)
{
    (void)command;
    errno = EPERM;
    return -1;
}

int property_get(const char *key, char *value, const char *default_value)
{
    return other_property_get(key, value, default_value);
}
