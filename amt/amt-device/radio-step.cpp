#include "amt/amt-device/radio-step.h"

#include "pub/error.h"

void amt_radio_step_start(const amt_radio_step_st &step)
{
    PUB_LOG(*step.m_source_ptr, "%s start", step.m_title_ptr);
}

int amt_radio_step_end(const amt_radio_step_st &step, int32_t answer, int line)
{
    PUB_LOG(*step.m_source_ptr, "%s end. return:%d.", step.m_title_ptr, answer);
    return amt_radio_step_check(step, answer, line);
}

int amt_radio_step_check(const amt_radio_step_st &step, int32_t answer, int line)
{
    if (answer == 0) {
        return PUB_ERR_NONE;
    }
    return pub_log_fail({*step.m_source_ptr, step.m_handler_ptr, line}, PUB_ERR_FAIL,
                        "%s error. call %s fail: %d", step.m_title_ptr, step.m_call_ptr, answer);
}
