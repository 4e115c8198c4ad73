#pragma once

#include <stdint.h>

#include "pub/log/log.h"

/*
 * One call of the connectivity test library and the lines around it:
 *   TITLE start
 *   TITLE end. return:%d.
 *   TITLE error. call CALL fail: %d        (when it failed, behind the error line with -100)
 */
struct amt_radio_step_st
{
    const pub_log_source_st *m_source_ptr;
    const char *m_title_ptr;
    const char *m_call_ptr;
};

void amt_radio_step_start(const amt_radio_step_st &step);

/* The two lines behind the call: result is what the library answered. func is the handler. Returns 0 or -100.
 */
int amt_radio_step_end(int line, const char *func, const amt_radio_step_st &step, int32_t result);

/* The failure lines alone, for calls whose end line tells more. Returns 0 or -100. */
int amt_radio_step_check(int line, const char *func, const amt_radio_step_st &step, int32_t result);

#define AMT_RADIO_STEP_END(func, step, result)   amt_radio_step_end(__LINE__, func, step, result)
#define AMT_RADIO_STEP_CHECK(func, step, result) amt_radio_step_check(__LINE__, func, step, result)
