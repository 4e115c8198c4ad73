#include "amt/amt-handle/at/at-handler.h"

#include <stdint.h>

#include "amt/amt-device/test-hal.h"
#include "amt/amt-handle/request/ap-version.h"
#include "amt/amt-handle/request/mode-switch.h"
#include "pub/error.h"

namespace {

constexpr uint32_t SW_VERSION_SIZE = 255;
constexpr uint32_t EMMC_INFO_SIZE = 100;

/* What the boot-download flag is until the library has told better. */
constexpr int32_t BOOT_DL_UNKNOWN = 2;

} // namespace

int amt_at_read_sw_version(const char *)
{
    char text_a[SW_VERSION_SIZE] = {};
    uint32_t length = 0;
    if (get_ap_sw_version(text_a, &length) != PUB_ERR_NONE) {
        return amt_at_reply_cme();
    }
    return amt_at_reply("\r\n^DSVER: %.*s\r\n\r\nOK\r\n", static_cast<int>(length), text_a);
}

int amt_at_power_off(const char *)
{
    const int status = amt_at_reply_ok();
    amt_power_off_handset();
    return status;
}

int amt_at_enter_idle(const char *)
{
    return amt_make_ue_enter_idle() == PUB_ERR_NONE ? amt_at_reply_ok() : amt_at_reply_error();
}

int amt_at_read_boot_dl_fin(const char *)
{
    int32_t flag = BOOT_DL_UNKNOWN;
    if (amt_boot_dl_fin_read(&flag) != PUB_ERR_NONE) {
        return amt_at_reply_error();
    }
    return amt_at_reply("\r\n^DBOOTDLFIN: %d\r\n\r\nOK\r\n", flag);
}

int amt_at_read_emmc_info(const char *)
{
    char text_a[EMMC_INFO_SIZE] = {};
    if (amt_read_emmc_info(text_a) != PUB_ERR_NONE) {
        return amt_at_reply_cme();
    }
    return amt_at_reply("\r\n^DEMMCINFO: \"%s\"\r\n\r\nOK\r\n", text_a);
}
