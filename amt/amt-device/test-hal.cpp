#include "amt/amt-device/test-hal.h"

#include <inttypes.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-device/hal-library.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/ap-version.h"
#include "amt/amt-packet.h"
#include "platform/include/amt-misc-hal.h"
#include "pub/error.h"

namespace {

/* The text fills a packet but for its frame. */
constexpr int32_t DEVICE_INFO_CAPACITY = 4055;
constexpr uint32_t EMMC_INFO_SIZE = 100;

/*
 * Loads the HAL and has call call the entry: logs, and stores the entry's answer. Returns 0 when the call was
 * made, or PUB_ERR_FILE with *answer_ptr left alone.
 */
template <typename entry_func, typename call_func>
int call_hal(const char *name, int32_t *answer_ptr, call_func call,
             const pub_log_place_st &place = g_amt_device_log)
{
    amt_hal_entry_st entry = {};
    if (amt_hal_load(AMT_MISC_HAL_LIBRARY, name, &entry, place) != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    PUB_LOG(g_amt_device_log, "will call %s.", name);
    *answer_ptr = call(reinterpret_cast<entry_func>(entry.m_entry_ptr));
    PUB_LOG(g_amt_device_log, "stop call %s. return value:%d.", name, *answer_ptr);
    amt_hal_unload(&entry);
    return PUB_ERR_NONE;
}

} // namespace

int amt_make_ue_enter_idle()
{
    pub_log_entry(g_amt_device_log);
    int32_t answer = 0;
    const int status = call_hal<amt_misc_hal_enter_idle_func>(AMT_MISC_HAL_ENTER_IDLE, &answer,
                                                              [](auto entry) { return entry(); });
    if (status != PUB_ERR_NONE) {
        return status;
    }
    if (answer == 0) {
        PUB_LOG(g_amt_device_log, "enter_idle return OK.");
    }
    return answer;
}

int amt_usb_charge_ctrl(int32_t mode)
{
    PUB_LOG(g_amt_device_log, "will call amt_usb_charger_enable , type:%d.", mode);
    if (mode < 0) {
        return pub_log_fail(g_amt_device_log, PUB_ERR_PARAM, "parameter type(%d) is not valid.", mode);
    }
    int32_t answer = 0;
    const int status = call_hal<amt_misc_hal_usb_charger_enable_func>(
        AMT_MISC_HAL_USB_CHARGER_ENABLE, &answer, [mode](auto entry) { return entry(mode); });
    if (status != PUB_ERR_NONE) {
        return status;
    }
    if (answer == 0) {
        PUB_LOG(g_amt_device_log, "amt_usb_charger_enable return OK.");
    }
    return answer;
}

int amt_boot_dl_fin_read(int32_t *verdict_ptr)
{
    PUB_LOG(g_amt_device_log, "amt_boot_dl_fin_read start.");
    *verdict_ptr = 0;
    return call_hal<amt_misc_hal_check_sanity_func>(AMT_MISC_HAL_CHECK_SANITY, verdict_ptr,
                                                    [](auto entry) { return entry(); });
}

int amt_read_dev_info(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_READ_DEV_INFO_RSPCMD);
    char text_a[DEVICE_INFO_CAPACITY + 1] = {};
    int32_t answer = 0;
    const int status = call_hal<amt_misc_hal_create_devinfo_func>(
        AMT_MISC_HAL_CREATE_DEVINFO, &answer,
        [&text_a](auto entry) { return entry(text_a, DEVICE_INFO_CAPACITY); });
    if (status != PUB_ERR_NONE || answer != 0) {
        return status != PUB_ERR_NONE ? status : answer;
    }
    PUB_LOG(g_amt_device_log, "create_devinfo return OK. %s", text_a);
    amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_DEVICE_INFO, text_a);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    return amt_handle_send_rsp(channel, rsp_ptr);
}

int amt_enter_idle(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    if (const int status = amt_make_ue_enter_idle(); status != PUB_ERR_NONE) {
        return status;
    }
    PUB_LOG(g_amt_device_log, "enter_idle return OK.");
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_ENTER_IDLE_RSPCMD);
}

int amt_modem_boot_dl_fin_read(uint32_t channel, amt_buf_st *, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_handle_log);
    PUB_LOG(g_amt_handle_log, "amt_modem_boot_dl_fin_read.");
    amt_reply_start(rsp_ptr, AMT_READ_BOOT_DOWNLOAD_RSPCMD);
    int32_t flag = 0;
    const int status = amt_boot_dl_fin_read(&flag);
    PUB_LOG(g_amt_handle_log, "amt_modem_boot_dl_fin_read finished. flag:%" PRId32 "; ret_val:%d.", flag,
            status);
    if (status != PUB_ERR_NONE) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "read error");
    }
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_BOOT_DOWNLOAD, flag);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_device_emmc_info(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_READ_EMMC_INFO_RSPCMD);
    char text_a[EMMC_INFO_SIZE] = {};
    if (amt_read_emmc_info(text_a) != PUB_ERR_NONE) {
        return pub_log_fail(g_amt_device_log, PUB_ERR_FAIL, "read error");
    }
    PUB_LOG(g_amt_device_log, "read emmc_info: %s", text_a);
    amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_EMMC_INFO, text_a);
    return amt_reply_finish_ok(channel, rsp_ptr);
}
