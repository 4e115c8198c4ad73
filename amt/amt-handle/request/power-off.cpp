#include "amt/amt-handle/request/power-off.h"

#include <sys/reboot.h>

#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/util/thread-end.h"

namespace {

constexpr uint32_t ANSWER_PAUSE_MS = 2000;

} // namespace

void amt_power_off_handset()
{
    pub_util_sleep_ms(ANSWER_PAUSE_MS);
    if (reboot(RB_POWER_OFF) != 0) {
        pub_log_sys_call(g_amt_handle_log, "reboot");
        pub_log_error(g_amt_handle_log, PUB_ERR_SYS_CALL);
    }
}
