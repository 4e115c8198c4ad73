#pragma once

#include <stdint.h>

/*
 * Where a failure is told from: the function that the log line names and the line in its source. {} is the
 * caller's own, {"amt_device_audio"} names the handler from within one of its helpers.
 */
struct amt_device_place_st
{
    const char *m_func_ptr;
    int m_line;

    constexpr amt_device_place_st(const char *func = __builtin_FUNCTION(), int line = __builtin_LINE())
        : m_func_ptr(func), m_line(line)
    {
    }
};

/*
 * The two lines of a failure: the error line of the place, then the text. Both show the errno of the failing
 * call, and errno is preserved. Returns code, so that a handler can return what it logs.
 */
int amt_device_fail(const amt_device_place_st &place, int code, const char *format, ...)
    __attribute__((format(printf, 3, 4)));

/*
 * The same for a failed system call: the error line with PUB_ERR_FAIL, then the line of the call. Returns
 * PUB_ERR_FAIL.
 */
int amt_device_fail_call(const amt_device_place_st &place, const char *call);
