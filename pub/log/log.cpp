#include "pub/log/log.h"

#include <errno.h>

namespace {

constexpr uint32_t FLAG_TEXT_SIZE = 32;

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

void pub_log_error(const pub_log_source_st &source, int error_code, const char *func, int line)
{
    PUB_LOG(source, "FILE-%s, LINE-%d, FUNC-%s(), error_code=%d, errno=%d", source.m_name_ptr, line, func,
            error_code, errno);
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
