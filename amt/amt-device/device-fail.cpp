#include "amt/amt-device/device-fail.h"

#include <stdarg.h>
#include <stdio.h>

#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

/* Holds a command text of 4096 bytes; every other text is far shorter. */
constexpr uint32_t TEXT_SIZE = 4352;

} // namespace

int amt_device_fail(const amt_device_place_st &place, int code, const char *format, ...)
{
    pub_log_error(g_amt_device_log, code, place.m_func_ptr, place.m_line);
    char text_a[TEXT_SIZE];
    va_list args;
    va_start(args, format);
    vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    PUB_LOG(g_amt_device_log, "%s", text_a);
    return code;
}

int amt_device_fail_call(const amt_device_place_st &place, const char *call)
{
    pub_log_error(g_amt_device_log, PUB_ERR_FAIL, place.m_func_ptr, place.m_line);
    pub_log_sys_call(g_amt_device_log, call);
    return PUB_ERR_FAIL;
}
