#include "amt/amt-device/radio-step.h"

#include "amt/amt-device/device-fail.h"
#include "pub/error.h"

void amt_radio_step_start(const amt_radio_step_st &step)
{
    PUB_LOG(*step.m_source_ptr, "%s start", step.m_title_ptr);
}

int amt_radio_step_end(int line, const char *func, const amt_radio_step_st &step, int32_t result)
{
    PUB_LOG(*step.m_source_ptr, "%s end. return:%d.", step.m_title_ptr, result);
    return amt_radio_step_check(line, func, step, result);
}

int amt_radio_step_check(int line, const char *func, const amt_radio_step_st &step, int32_t result)
{
    if (result == 0) {
        return PUB_ERR_NONE;
    }
    return amt_device_fail(*step.m_source_ptr, line, func, PUB_ERR_FAIL, "%s error. call %s fail: %d",
                           step.m_title_ptr, step.m_call_ptr, result);
}
