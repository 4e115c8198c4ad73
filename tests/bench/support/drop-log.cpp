#include "platform/include/android/log.h"

/* Takes the place of the platform's log: what it costs to write records down is measured on the whole
 * service. */
extern "C" int __android_log_print(int, const char *, const char *, ...)
{
    return 0;
}
