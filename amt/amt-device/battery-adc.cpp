#include "amt/amt-device/battery-adc.h"

#include <stdio.h>

#include "amt/amt-device/command.h"
#include "amt/amt-device/device-fail.h"
#include "amt/amt-handle/request/factory-file.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/file/scan.h"
#include "pub/util/thread-end.h"

namespace {

constexpr char MEASURE_COMMAND[] = "echo \"amt_get_vbatt\" > " AMT_BATTERY_DRIVER_FILE;
constexpr char CALIBRATION_FILE[] = "/amt/vbatt";
constexpr uint32_t MEASURE_MS = 20;

/* Four numbers of 11 characters, their frame and the terminating zero. */
constexpr uint32_t CALIBRATION_SIZE = 80;

} // namespace

int amt_read_adc(uint32_t *value_ptr)
{
    if (value_ptr == nullptr) {
        return amt_device_fail({}, PUB_ERR_FAIL, "Null pointer.");
    }
    if (amt_device_do_command(MEASURE_COMMAND) != PUB_ERR_NONE) {
        /* On purpose: a driver that cannot measure gives a value of 0, not an error. */
        return PUB_ERR_NONE;
    }
    pub_util_sleep_ms(MEASURE_MS);
    const pub_file_st file(AMT_BATTERY_DRIVER_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return amt_device_fail_call({}, "fopen");
    }
    const bool is_read = pub_file_scan_unsigned(file, value_ptr) == 1;
    if (is_read) {
        PUB_LOG(g_amt_device_log, "ADC value: %u", *value_ptr);
    } else {
        amt_device_fail_call({}, "fscanf");
    }
    return is_read ? PUB_ERR_NONE : PUB_ERR_FAIL;
}

int amt_write_adc_diff_value(int32_t a, int32_t b, int32_t c, int32_t d)
{
    char text_a[CALIBRATION_SIZE];
    snprintf(text_a, sizeof(text_a), "amt_set_vbatt[%d] [%d] [%d] [%d]", a, b, c, d);
    const amt_factory_step_en step = amt_factory_file_put(CALIBRATION_FILE, text_a);
    if (step == amt_factory_step_en::OPEN_FAILED) {
        return amt_device_fail_call({}, "fopen");
    }
    PUB_LOG(g_amt_device_log, "SAVA ADC value: %d %d %d %d", a, b, c, d);
    amt_factory_file_sync();
    return step == amt_factory_step_en::DONE ? PUB_ERR_NONE : amt_device_fail_call({}, "fprintf");
}
