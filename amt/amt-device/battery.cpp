#include "amt/amt-device/battery.h"

#include <stdio.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-file.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "pub/file/scan.h"
#include "pub/util/process.h"
#include "pub/util/thread-end.h"

namespace {

#define DRIVER_FILE "/proc/driver/sarvo_battery"

/* How the driver takes the calibration values: at boot from the file, at once on its own. */
#define CALIBRATION_FORMAT "amt_set_vbatt[%d] [%d] [%d] [%d]"

constexpr char VOLTAGE_FILE[] = "/sys/class/power_supply/battery/voltage_now";
constexpr char CALIBRATION_FILE[] = "/amt/vbatt";
constexpr char MEASURE_COMMAND[] = "echo \"amt_get_vbatt\" > " DRIVER_FILE;
constexpr char CHECK_HANDLER[] = "amt_device_battery_voltage_check";
constexpr uint32_t MEASURE_MS = 20;
constexpr uint32_t COMMAND_SIZE = 100;

/* Four numbers of 11 characters, their frame and the terminating zero. */
constexpr uint32_t CALIBRATION_SIZE = 80;

int build_adc_rsp(amt_buf_st *rsp_ptr)
{
    amt_reply_start(rsp_ptr, AMT_READ_ADC_RSPCMD);
    uint32_t value = 0;
    if (const int status = amt_read_adc(&value); status != PUB_ERR_NONE) {
        return status;
    }
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_BATTERY_ADC, static_cast<int32_t>(value));
    return PUB_ERR_NONE;
}

/* The driver takes the values at once; whether it did does not change the answer. */
void hand_to_driver(int32_t a, int32_t b, int32_t c, int32_t d)
{
    char command_a[COMMAND_SIZE];
    snprintf(command_a, sizeof(command_a), "echo \"" CALIBRATION_FORMAT "\" > " DRIVER_FILE, a, b, c, d);
    const int status = pub_util_run_shell(command_a);
    PUB_LOG(g_amt_device_log, "%s", command_a);
    if (status < 0) {
        pub_log_call_error({g_amt_device_log, CHECK_HANDLER}, "system", PUB_ERR_SYS_CALL);
    }
}

int build_calibration_rsp(const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    amt_reply_start(rsp_ptr, AMT_CALIBRATE_ADC_RSPCMD);
    const int32_t a = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_ADC_CALIBRATION_A);
    const int32_t b = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_ADC_CALIBRATION_B);
    const int32_t c = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_ADC_CALIBRATION_C);
    const int32_t d = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_ADC_CALIBRATION_D);
    if (const int status = amt_write_adc_diff_value(a, b, c, d); status != PUB_ERR_NONE) {
        return status;
    }
    hand_to_driver(a, b, c, d);
    return PUB_ERR_NONE;
}

int build_check_rsp(const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    const uint8_t command_id = amt_packet_get_cmd(req_ptr->m_buf_a);
    if (command_id == AMT_READ_ADC_CMD) {
        return build_adc_rsp(rsp_ptr);
    }
    if (command_id == AMT_CALIBRATE_ADC_CMD) {
        return build_calibration_rsp(req_ptr, rsp_ptr);
    }
    return pub_log_fail({g_amt_device_log, CHECK_HANDLER}, PUB_ERR_FAIL, "Invalid command id[%d]",
                        command_id);
}
} // namespace

int amt_read_adc(uint32_t *value_ptr)
{
    if (value_ptr == nullptr) {
        return pub_log_fail(g_amt_device_log, PUB_ERR_FAIL, "Null pointer.");
    }
    if (amt_device_do_command(MEASURE_COMMAND) != PUB_ERR_NONE) {
        /* On purpose: a driver that cannot measure gives a value of 0, not an error. */
        return PUB_ERR_NONE;
    }
    pub_util_sleep_ms(MEASURE_MS);
    const pub_file_st file(DRIVER_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return pub_log_error_call(g_amt_device_log, PUB_ERR_FAIL, "fopen");
    }
    const bool is_read = pub_file_scan_unsigned(file, value_ptr) == 1;
    if (is_read) {
        PUB_LOG(g_amt_device_log, "ADC value: %u", *value_ptr);
    } else {
        pub_log_error_call(g_amt_device_log, PUB_ERR_FAIL, "fscanf");
    }
    return is_read ? PUB_ERR_NONE : PUB_ERR_FAIL;
}

int amt_write_adc_diff_value(int32_t a, int32_t b, int32_t c, int32_t d)
{
    char text_a[CALIBRATION_SIZE];
    snprintf(text_a, sizeof(text_a), CALIBRATION_FORMAT, a, b, c, d);
    const pub_file_step_en step = amt_factory_file_write(CALIBRATION_FILE, text_a);
    if (step == pub_file_step_en::OPEN_FAILED) {
        return pub_log_error_call(g_amt_device_log, PUB_ERR_FAIL, "fopen");
    }
    PUB_LOG(g_amt_device_log, "SAVA ADC value: %d %d %d %d", a, b, c, d);
    return step == pub_file_step_en::DONE ? PUB_ERR_NONE
                                          : pub_log_error_call(g_amt_device_log, PUB_ERR_FAIL, "fprintf");
}

int amt_device_battery_voltage(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    int32_t voltage = 0;
    if (amt_device_file_read_int(VOLTAGE_FILE, &voltage) != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    PUB_LOG(g_amt_device_log, "battery_voltage: %d", voltage);
    amt_reply_start(rsp_ptr, AMT_READ_BATTERY_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_BATTERY_VOLTAGE, voltage);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    return amt_handle_send_rsp(channel, rsp_ptr);
}

int amt_device_battery_voltage_check(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int status = build_check_rsp(req_ptr, rsp_ptr);
    return status == PUB_ERR_NONE ? amt_reply_finish_ok(channel, rsp_ptr) : status;
}
