#include "amt/amt-device/device-file.h"

#include <errno.h>
#include <string.h>

#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/util/process.h"

namespace {

constexpr int ATTEMPT_COUNT = 5;

} // namespace

int amt_device_do_command(const char *command)
{
    for (int attempt = 1; attempt <= ATTEMPT_COUNT; attempt++) {
        /* A shell leaves errno alone when the command itself fails; an older errno would mislead. */
        errno = 0;
        if (pub_util_run_shell(command) == 0) {
            PUB_LOG(g_amt_device_log, "system(%s) OK", command);
            return PUB_ERR_NONE;
        }
        pub_log_fail(g_amt_device_log, PUB_ERR_FILE, "system(%s) FAIL[count = %d]: %d - %s", command, attempt,
                     errno, strerror(errno));
    }
    return PUB_ERR_FAIL;
}
