#include "amt/amt-handle/reader/registry.h"

#include <iterator>

#include "amt/amt-command.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-gps.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/identity-request.h"
#include "amt/amt-handle/request/mode-switch.h"
#include "amt/amt-handle/request/modem-tunnel.h"
#include "amt/amt-handle/request/modem-value.h"
#include "amt/amt-handle/request/test-result.h"
#include "amt/amt-handle/request/version.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

struct registration_st
{
    uint32_t m_id;
    amt_handle_func m_handler;
    amt_ack_en m_ack = amt_ack_en::DISPATCHER;
};

/* What the PC may ask. Any other id goes on as text, in the end to the modem. Ids in numbers have no name. */
constexpr registration_st g_pc_registration_a[] = {
    {AMT_VERSION_CMD, handle_amt_pc_req_version, amt_ack_en::HANDLER},
    {AMT_BLUETOOTH_CMD, amt_device_bt},
    {AMT_BLUETOOTH_ADDRESS_CMD, amt_device_bt_address},
    {AMT_WIFI_TEST_CMD, amt_device_wifi_address},
    {AMT_WIFI_RTX_TEST_CMD, amt_device_wifi_rtx_test},
    {AMT_GPS_CONTROL_CMD, amt_gps_control},
    {AMT_GPS_TEST_CMD, amt_gps_test},
    {AMT_GPS_READ_RESULT_CMD, amt_gps_read_result},
    {191, amt_handle_adb_serial_no},
    {224, amt_device_battery_voltage_check},
    {226, amt_device_battery_voltage_check},
    {236, amt_handle_power_off},
    {AMT_BOARD_PCBA_CTRL_CMD, amt_handle_board_pcba_ctrl},
    {AMT_DAMT1_CMD, amt_handle_not_permit_handshake},
    {AMT_ENTER_IDLE_CMD, amt_enter_idle},
    {AMT_WRITE_TEST_RESULT_CMD, amt_modem_write_pc_test_result, amt_ack_en::HANDLER},
    {244, amt_modem_boot_dl_fin_read},
    {246, amt_device_emmc_info},
};

/*
 * What the app may ask. A response id is served like a request in two places (AMT_KEYBOARD_RSPCMD and
 * CELL_RECIEVE_RSPDATA), and AMT_DAMT1_CMD is registered twice: the last row replaces the modem's handler.
 */
constexpr registration_st g_app_registration_a[] = {
    {AMT_READFLASH_CMD, amt_modem_handle_req},
    {AMT_WRITEFLASH_CMD, amt_modem_handle_req},
    {AMT_WRITEIMEI_CMD, amt_modem_handle_req},
    {AMT_READIMEI_CMD, amt_modem_handle_req},
    {AMT_READ_BATTERY_CMD, amt_device_battery_voltage},
    {AMT_STARTTX_CMD, amt_modem_handle_req},
    {AMT_STOPTX_CMD, amt_modem_handle_req},
    {AMT_CHANGETXPOWER_CMD, amt_modem_handle_req},
    {AMT_CHANGETXFREQ_CMD, amt_modem_handle_req},
    {AMT_STARTRX_CMD, amt_modem_handle_req},
    {AMT_STOPRX_CMD, amt_modem_handle_req},
    {AMT_RXDATA_CMD, amt_modem_handle_req},
    {AMT_IQPOWER_CMD, amt_modem_handle_req},
    {AMT_CHANGERXFREQ_CMD, amt_modem_handle_req},
    {AMT_SHOWLCD_CMD, amt_device_lcd_color},
    {AMT_AUDIOLOOP_CMD, amt_device_audio_loop},
    {AMT_BELL_CMD, amt_device_audio},
    {AMT_VIBRATION_CMD, amt_device_vibrator},
    {AMT_BACKLIGHT_CMD, amt_device_button_backlight},
    {AMT_CHANGEMODE_CMD, amt_modem_handle_req},
    {AMT_KEYBOARD_CMD, amt_modem_handle_req},
    {AMT_KEYBOARD_RSPCMD, amt_modem_handle_req},
    {AMT_KEYVALUE_CMD, amt_modem_handle_req},
    {AMT_VERSION_CMD, handle_amt_req_version},
    {AMT_READTABLE_MEMORY_CMD, amt_modem_handle_req},
    {AMT_WRITETABLE_MEMORY_CMD, amt_modem_handle_req},
    {AMT_READ_BATTERYADC_CMD, amt_modem_handle_req},
    {AMT_WRITE_BATTERYADC_CMD, amt_modem_handle_req},
    {AMT_TEMPERATURE_CMD, amt_modem_handle_temperature},
    {AMT_LCDLIGHT_CMD, amt_device_lcd_brightness},
    {AMT_READ_RFADC_CMD, amt_modem_handle_req},
    {AMT_READTABLE_FLASH_CMD, amt_modem_handle_req},
    {AMT_WRITETABLE_FLASH_CMD, amt_modem_handle_req},
    {AMT_READ_OUTDATE_CMD, amt_modem_handle_read_outdate},
    {AMT_WRITE_OUTDATE_CMD, amt_modem_handle_req},
    {AMT_READ_FLUSHDATE_CMD, amt_modem_handle_req},
    {AMT_EXIT_CMD, amt_modem_handle_req},
    {AMT_WRITE_CONTROL_CMD, amt_modem_handle_req},
    {AMT_READ_CONTROL_CMD, amt_modem_handle_req},
    {AMT_IQSERIAL_CMD, amt_modem_handle_req},
    {AMT_IQCHECK_CMD, amt_modem_handle_req},
    {AMT_WRITE_GAININ_CMD, amt_modem_handle_req},
    {AMT_READ_GAININ_CMD, amt_modem_handle_req},
    {AMT_READ_BOARD_CMD, amt_modem_handle_read_board},
    {AMT_WRITE_BOARD_CMD, amt_modem_handle_req},
    {AMT_READ_TEST_RESULT_CMD, amt_modem_read_test_result},
    {AMT_WRITE_TEST_RESULT_CMD, amt_modem_write_test_result},
    {AMT_WRITE_VERSION_CMD, amt_modem_handle_req},
    {AMT_WRITE_MIC_PREAMP_CMD, amt_modem_handle_req},
    {AMT_READ_MIC_PREAMP_CMD, amt_modem_handle_req},
    {AMT_REFRESHTABLE_FLASH_CMD, amt_modem_handle_req},
    {AMT_GPIO_CMD, amt_modem_handle_req},
    {AMT_GSM_TRANSPARENT_CONTROL_CMD, amt_modem_handle_req},
    {AMT_GSM_READTABLE_FLASH_TO_MEMORY_CMD, amt_modem_handle_req},
    {AMT_GSM_READTABLE_FLAG_FLASH_CMD, amt_modem_handle_req},
    {AMT_GSM_REFRESHTABLE_MEMORY_TO_FLASH_CMD, amt_modem_handle_req},
    {AMT_GSM_READTABLE_MEMORY_CMD, amt_modem_handle_req},
    {AMT_GSM_WRITETABLE_MEMORY_CMD, amt_modem_handle_req},
    {AMT_DIAL_CMD, amt_modem_handle_req},
    {AMT_HUNGUP_CMD, amt_modem_handle_req},
    {AMT_SWITCH_MODE_CMD, amt_modem_handle_req},
    {AMT_WRITE_GAINOUT_CMD, amt_modem_handle_req},
    {AMT_READ_GAINOUT_CMD, amt_modem_handle_req},
    {AMT_WRITE_MIC_GAININ_CMD, amt_modem_handle_req},
    {AMT_READ_MIC_GAININ_CMD, amt_modem_handle_req},
    {AMT_SET_DEFAULT_ACCESS_TECH_CMD, amt_modem_handle_req},
    {AMT_WRITECARD_CMD, amt_modem_handle_req},
    {AMT_READCARD_CMD, amt_modem_handle_req},
    {AMT_READCAPABILITY_CARD_CMD, amt_device_tf_card},
    {AMT_CAMERA_PREVIEW_CMD, amt_device_camera},
    {AMT_SECOND_CAMERA_PREVIEW_CMD, amt_device_camera},
    {AMT_NVRESUME_CMD, amt_modem_handle_req},
    {AMT_DSP_TRANSPARENT_CONTROL_CMD, amt_modem_handle_req},
    {AMT_EDGE_READTABLE_FLASH_TO_MEMORY_CMD, amt_modem_handle_req},
    {AMT_EDGE_REFRESHTABLE_MEMORY_TO_FLASH_CMD, amt_modem_handle_req},
    {AMT_BLUETOOTH_CMD, amt_device_bt},
    {AMT_BLUETOOTH_ADDRESS_CMD, amt_device_bt_address},
    {AMT_WIFI_TEST_CMD, amt_device_wifi_address},
    {AMT_GPS_CONTROL_CMD, amt_gps_control},
    {AMT_GPS_TEST_CMD, amt_gps_test},
    {AMT_GPS_READ_RESULT_CMD, amt_gps_read_result},
    {AMT_CAMERA_CONTROL_CMD, amt_device_camera_control},
    {CELL_SWITCH_MODE_CMD, amt_modem_handle_req},
    {CELL_RECIEVE_RSPDATA, amt_modem_handle_req},
    {CELL_READ_VERSION_CMD, amt_modem_handle_req},
    {CELL_READ_IDEN_CMD, amt_modem_handle_req},
    {CELL_SET_EXCEPTIONAL_RESET_CMD, amt_modem_handle_req},
    {CELL_QUERY_EXCEPTIONAL_RESET_CMD, amt_modem_handle_req},
    {CELL_CAMP_ON_CELL_CONTROL_CMD, amt_modem_handle_req},
    {AMT_DAMT1_CMD, amt_modem_handle_req},
    {AMT_DSP_TRANSPARENT_CONTROL_INDCMD, amt_modem_handle_req},
    {228, amt_item_read_test_result},
    {230, amt_item_write_test_result},
    {AMT_WIFI_RTX_TEST_CMD, amt_device_wifi_rtx_test},
    {232, amt_at_to_modem},
    {AMT_USIMCHECK_CMD, amt_dtoc_checkSIM},
    {234, amt_read_serial_number},
    {AMT_READ_DEV_INFO_CMD, amt_read_dev_info},
    {AMT_ENTER_IDLE_CMD, amt_enter_idle},
    {AMT_NORMAL_TO_AMT_CMD, amt_handle_normal_to_amt},
    {AMT_NORMAL_TO_AMT_SUPPORT_CMD, amt_query_amt_support},
    {AMT_DAMT1_CMD, amt_handle_damt1_cmd},
};

void register_table(int table, const registration_st *row_ptr, const registration_st *end_ptr)
{
    for (; row_ptr != end_ptr; row_ptr++) {
        amt_handle_reg_handle_func(table, row_ptr->m_id, row_ptr->m_handler, row_ptr->m_ack);
    }
}

} // namespace

int amt_handle_reg_handle_func(int table, uint32_t id, amt_handle_func handler, amt_ack_en ack)
{
    if (id >= AMT_HANDLE_FUNC_COUNT) {
        return pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
    }
    const bool is_pc = table == AMT_TABLE_PC;
    amt_handle_func *const slot_ptr =
        is_pc ? &g_handle_context.m_handle_pc_func_a[id] : &g_handle_context.m_handle_app_func_a[id];
    if (handler == nullptr) {
        PUB_LOG(g_amt_handle_log, "WARNING !");
        PUB_LOG(g_amt_handle_log, "clean the handle function of request id: %u", id);
    }
    if (*slot_ptr != nullptr) {
        PUB_LOG(g_amt_handle_log, "WARNING !");
        PUB_LOG(g_amt_handle_log, "re-register the handle function of request id: %u", id);
    }
    *slot_ptr = handler;
    if (is_pc) {
        g_handle_context.m_pc_ack_a[id] = ack;
    }
    PUB_LOG(g_amt_handle_log, "%s register command id: %u(0x%02x) - %s", is_pc ? "PC" : "APP", id, id,
            amt_cmd_name_table[id]);
    return PUB_ERR_NONE;
}

void amt_handle_register_all()
{
    register_table(AMT_TABLE_PC, std::begin(g_pc_registration_a), std::end(g_pc_registration_a));
    register_table(AMT_TABLE_APP, std::begin(g_app_registration_a), std::end(g_app_registration_a));
}
