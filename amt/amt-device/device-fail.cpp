#include "amt/amt-device/device-fail.h"

#include <stdarg.h>
#include <stdio.h>

#include "pub/error.h"

namespace {

/* Holds a command text of 4096 bytes; every other text is far shorter. */
constexpr uint32_t TEXT_SIZE = 4352;

} // namespace

int amt_device_fail(const pub_log_source_st &source, int line, const char *func, int code, const char *format,
                    ...)
{
    pub_log_error(source, code, func, line);
    char text_a[TEXT_SIZE];
    va_list args;
    va_start(args, format);
    vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    PUB_LOG(source, "%s", text_a);
    return code;
}

int amt_device_fail_call(int line, const char *func, const char *call)
{
    pub_log_error(g_amt_device_log, PUB_ERR_FAIL, func, line);
    pub_log_sys_call(g_amt_device_log, call);
    return PUB_ERR_FAIL;
}
