#include "pub/log/log.h"

#include <errno.h>
#include <stdarg.h>
#include <stdio.h>

#include "pub/error.h"

namespace {

constexpr uint32_t FLAG_TEXT_SIZE = 32;

/* Holds a command text of 4096 bytes; every other text is far shorter. */
constexpr uint32_t FAIL_TEXT_SIZE = 4352;

/* Set while this thread is inside the platform's log, whose locks a signal handler must not meet again. */
struct guard_st
{
    volatile bool m_is_logging;
    int m_errno;
};
thread_local guard_st t_guard;

} // namespace

void pub_log_prepare_thread()
{
    t_guard.m_is_logging = false;
}

bool pub_log_begin()
{
    if (t_guard.m_is_logging) {
        return false;
    }
    t_guard.m_errno = errno;
    t_guard.m_is_logging = true;
    return true;
}

void pub_log_end()
{
    t_guard.m_is_logging = false;
    errno = t_guard.m_errno;
}

void pub_log_entry(const pub_log_source_st &source, const char *func)
{
    PUB_LOG(source, "%s()", func);
}

int pub_log_error(const pub_log_place_st &place, int error_code)
{
    PUB_LOG(place.m_source, "FILE-%s, LINE-%d, FUNC-%s(), error_code=%d, errno=%d", place.m_source.m_name_ptr,
            place.m_line, place.m_func_ptr, error_code, errno);
    return error_code;
}

int pub_log_fail(const pub_log_place_st &place, int error_code, const char *format, ...)
{
    pub_log_error(place, error_code);
    const int saved_errno = errno;
    char text_a[FAIL_TEXT_SIZE];
    va_list args;
    va_start(args, format);
    vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    errno = saved_errno;
    PUB_LOG(place.m_source, "%s", text_a);
    return error_code;
}

int pub_log_error_call(const pub_log_place_st &place, int error_code, const char *call)
{
    pub_log_error(place, error_code);
    pub_log_sys_call(place.m_source, call);
    return error_code;
}

int pub_log_call_error(const pub_log_place_st &place, const char *call, int error_code)
{
    pub_log_sys_call(place.m_source, call);
    return pub_log_error(place, error_code);
}

void pub_log_sys_call(const pub_log_source_st &source, const char *call)
{
    PUB_LOG(source, "sys call: %s() failed! errno = %d", call, errno);
}

void pub_log_flags(const pub_log_source_st &source, std::initializer_list<bool> fault_list)
{
    char text_a[FLAG_TEXT_SIZE] = {};
    uint32_t used = 0;
    for (const bool fault : fault_list) {
        if (used + sizeof(", 1") > sizeof(text_a)) {
            break;
        }
        if (used != 0) {
            text_a[used++] = ',';
            text_a[used++] = ' ';
        }
        text_a[used++] = fault ? '1' : '0';
    }
    PUB_LOG(source, "%s", text_a);
}

int pub_log_bad_param(const pub_log_place_st &place, std::initializer_list<bool> fault_list)
{
    pub_log_error(place, PUB_ERR_PARAM);
    pub_log_flags(place.m_source, fault_list);
    return PUB_ERR_PARAM;
}

void pub_log_dump(const pub_log_source_st &source, const char *title, const uint8_t *data, uint32_t length)
{
    static constexpr char digit_a[] = "0123456789ABCDEF";
    char text_a[2 * sizeof(uint8_t[PUB_LOG_DUMP_SIZE]) + sizeof("...")];
    const uint32_t shown = length < PUB_LOG_DUMP_SIZE ? length : PUB_LOG_DUMP_SIZE;
    char *out = text_a;
    for (uint32_t i = 0; i < shown; i++) {
        *out++ = digit_a[data[i] >> 4];
        *out++ = digit_a[data[i] & 0x0F];
    }
    for (const char *dot = shown < length ? "..." : ""; *dot != '\0'; dot++) {
        *out++ = *dot;
    }
    *out = '\0';
    PUB_LOG(source, "%s: (data_len = %u) -- %s", title, length, text_a);
}
