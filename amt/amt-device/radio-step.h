#pragma once

#include <stdint.h>

#include "pub/log/log.h"

/*
 * One call of the connectivity test library and the lines around it:
 *   TITLE start
 *   TITLE end. return:%d.
 *   TITLE error. call CALL fail: %d        (when it failed, behind the error line with PUB_ERR_FAIL)
 */
struct amt_radio_step_st
{
    const pub_log_source_st *m_source_ptr;
    const char *m_handler_ptr; /* the function that the error line names */
    const char *m_title_ptr;
    const char *m_call_ptr;
};

/* The line before the call. */
void amt_radio_step_start(const amt_radio_step_st &step);

/* The lines behind the call: answer is what the library answered. Returns 0 or PUB_ERR_FAIL. */
int amt_radio_step_end(const amt_radio_step_st &step, int32_t answer, int line = __builtin_LINE());

/* The failure lines alone, for calls whose end line tells more. Returns 0 or PUB_ERR_FAIL. */
int amt_radio_step_check(const amt_radio_step_st &step, int32_t answer, int line = __builtin_LINE());
