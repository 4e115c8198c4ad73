/* The library of properties in a system whose kernel will not be switched off: every such wish is refused. */
#include <errno.h>

int reboot(int command)
{
    (void)command;
    errno = EPERM;
    return -1;
}
