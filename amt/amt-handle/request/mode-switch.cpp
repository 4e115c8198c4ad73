#include "amt/amt-handle/request/mode-switch.h"

#include <inttypes.h>
#include <signal.h>
#include <string.h>
#include <sys/reboot.h>
#include <unistd.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/handshake-permission.h"
#include "amt/amt-packet.h"
#include "platform/include/cutils/properties.h"
#include "pub/error.h"
#include "pub/util/thread-end.h"

namespace {

constexpr const char *SWITCH_PROPERTY = "amt.normal.amt.switch_status";
constexpr const char *USB_PROPERTY = "sys.usb.config";
constexpr const char *USB_UNSET = "@#no_set_config#@"; /* holds no function that could be looked for */
constexpr const char *STOP_PROPERTY = "ctl.stop";
constexpr const char *SIBLING_SERVICE = "vx-kel-mla0";

/* How long the app and the station have for reading the answer before their line goes down. */
constexpr uint32_t APP_PAUSE_MS = 500;
constexpr uint32_t PC_PAUSE_MS = 2000;

constexpr amt_at_exchange_st g_band_exchange = {"amt_change_band", amt_at_trace_en::TEXT, AMT_AT_OK, false,
                                                nullptr};
constexpr amt_at_exchange_st g_switch_exchange = {"amt_handle_normal_to_amt", amt_at_trace_en::TEXT,
                                                  AMT_AT_OK, false, nullptr};

int switch_modem(int32_t mode)
{
    if (const int status = amt_change_band(0); status != PUB_ERR_NONE) {
        return status;
    }
    amt_at_set_command("AT^DSWAMT=%" PRId32 "\r", mode);
    return amt_at_exchange(g_switch_exchange, nullptr);
}

void activate_usb_serial()
{
    char config_a[PROPERTY_VALUE_MAX] = {};
    property_get(USB_PROPERTY, config_a, USB_UNSET);
    PUB_LOG(g_amt_handle_log, "property-%s value: %s", USB_PROPERTY, config_a);
    if (strstr(config_a, "serial") != nullptr) {
        PUB_LOG(g_amt_handle_log, "already activate serial, do not reset. ");
        return;
    }
    constexpr const char *usb_serial = "serial,adb";
    PUB_LOG(g_amt_handle_log, "will set property(%s) to %s.", USB_PROPERTY, usb_serial);
    property_set(USB_PROPERTY, usb_serial);
}

void end_program()
{
    PUB_LOG(g_amt_handle_log, "will exit program.");
    pub_util_sleep_ms(APP_PAUSE_MS);
    const int stopped = property_set(STOP_PROPERTY, SIBLING_SERVICE);
    PUB_LOG(g_amt_handle_log, "stop vx-kel-mla return: %d", stopped);
    kill(getpid(), SIGTERM);
}

/* As amt_reply_enter, for the handlers that accept an empty request. */
int enter_with_any_request(uint32_t channel, const amt_buf_st *req_ptr, const amt_buf_st *rsp_ptr,
                           const pub_log_place_st &place = g_amt_handle_log)
{
    pub_log_entry(place.m_source, place.m_func_ptr);
    if (channel != AMT_CHANNEL_NONE && req_ptr != nullptr && rsp_ptr != nullptr) {
        return PUB_ERR_NONE;
    }
    return pub_log_bad_param(place, {channel == AMT_CHANNEL_NONE, req_ptr == nullptr, rsp_ptr == nullptr});
}

} // namespace

int amt_change_band(int32_t band)
{
    pub_log_entry(g_amt_handle_log);
    PUB_LOG(g_amt_handle_log, "amt_change_band band:%" PRId32, band);
    amt_at_set_command("AT^DMPCHN=%" PRId32 "\r", band);
    return amt_at_exchange(g_band_exchange, nullptr);
}

int amt_handle_normal_to_amt(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter_modem(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const int32_t mode = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_WANTED_MODE);
    PUB_LOG(g_amt_handle_log, "amt_handle_normal_to_amt amt_mode:%" PRId32, mode);
    if (switch_modem(mode) != PUB_ERR_NONE) {
        return amt_reply_fail(channel, rsp_ptr, AMT_NORMAL_TO_AMT_RSPCMD);
    }
    constexpr const char *switched = "1";
    property_set(SWITCH_PROPERTY, switched);
    PUB_LOG(g_amt_handle_log, "set property(%s) to %s.", SWITCH_PROPERTY, switched);
    amt_reply_start(rsp_ptr, AMT_NORMAL_TO_AMT_RSPCMD);
    status = amt_reply_finish_ok(channel, rsp_ptr);
    activate_usb_serial();
    end_program();
    return status;
}

int amt_handle_damt1_cmd(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter_modem(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_HANDSHAKE);
    PUB_LOG(g_amt_handle_log, "amt_handle_damt1_cmd op_type:%" PRId32, operation);
    int flag = 0;
    status = handle_amt_damt1_operation(operation, &flag);
    PUB_LOG(g_amt_handle_log, "amt_handle_damt1_cmd op_type:%" PRId32 "; flag:%d; ret_val:%d.", operation,
            flag, status);
    if (status != PUB_ERR_NONE) {
        return amt_reply_fail(channel, rsp_ptr, AMT_DAMT1_RSPCMD);
    }
    amt_reply_start(rsp_ptr, AMT_DAMT1_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_HANDSHAKE, flag);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_handle_not_permit_handshake(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (enter_with_any_request(channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    int same_flag = 0;
    if (const int status =
            handle_amt_damt1_operation(static_cast<int>(amt_permission_en::FORBID), &same_flag);
        status != PUB_ERR_NONE)
    {
        return status;
    }
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_DAMT1_RSPCMD);
}

int amt_handle_power_off(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (enter_with_any_request(channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int status = amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_POWER_OFF_RSPCMD);
    amt_power_off_handset();
    return status;
}

void amt_power_off_handset()
{
    pub_util_sleep_ms(PC_PAUSE_MS);
    if (reboot(RB_POWER_OFF) != 0) {
        pub_log_call_error(g_amt_handle_log, "reboot", PUB_ERR_SYS_CALL);
    }
}
