#pragma once

#include "amt/amt-log.h"

/*
 * The two lines of a failure: the error line of the named function, then the text. Both show the errno of the
 * call, and errno is preserved. Returns code, so that a handler can return what it logs.
 *
 * The function is named by the caller, because the lines name the handler, whichever helper found the fault.
 */
int amt_device_fail(const pub_log_source_st &source, int line, const char *func, int code, const char *format,
                    ...) __attribute__((format(printf, 5, 6)));

/* The same for a failed system call: the error line with -100, then the line of the call. Returns -100. */
int amt_device_fail_call(int line, const char *func, const char *call);

#define AMT_DEVICE_FAIL(func, code, ...) amt_device_fail(g_amt_device_log, __LINE__, func, code, __VA_ARGS__)
#define AMT_DEVICE_FAIL_CALL(func, call) amt_device_fail_call(__LINE__, func, call)
#define AMT_GPS_FAIL(func, code, ...)    amt_device_fail(g_amt_gps_log, __LINE__, func, code, __VA_ARGS__)
