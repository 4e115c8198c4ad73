#include "amt/amt-handle/channel/at-exchange.h"

#include <stdarg.h>
#include <stdio.h>
#include <string.h>

#include "amt/amt-handle/channel/at-io.h"
#include "amt/amt-log.h"
#include "pub/error.h"

amt_at_area_st g_at_transmit;
amt_at_area_st g_at_receive;

namespace {

constexpr std::string_view g_error_a[] = {"\r\n+CME ERROR", "\r\n+CMS ERROR", "\r\nERROR\r\n"};
constexpr std::string_view LINE_END = "\r\n";

void clear_area(amt_at_area_st *area_ptr)
{
    memset(area_ptr, 0, sizeof(*area_ptr));
}

bool holds(std::string_view text)
{
    return amt_at_received().find(text) != std::string_view::npos;
}

bool holds_error()
{
    for (const std::string_view error : g_error_a) {
        if (holds(error)) {
            return true;
        }
    }
    return false;
}

int read_more()
{
    amt_at_area_st &area = g_at_receive;
    int32_t count = 0;
    const int status = read_at(area.m_text_a + area.m_len, AMT_AT_AREA_SIZE - area.m_len, &count);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    area.m_len += static_cast<uint32_t>(count);
    return PUB_ERR_NONE;
}

void trace_read(const amt_at_exchange_st &exchange, int status)
{
    switch (exchange.m_trace) {
    case amt_at_trace_en::NONE:
        break;
    case amt_at_trace_en::TEXT:
        PUB_LOG(g_amt_handle_log, "%s :%s", exchange.m_name_ptr, g_at_receive.m_text_a);
        break;
    case amt_at_trace_en::STATUS:
        PUB_LOG(g_amt_handle_log, "%s  ret_val[%d] m_buf_a[%s]", exchange.m_name_ptr, status,
                g_at_receive.m_text_a);
        break;
    }
}

int wait_final(const amt_at_exchange_st &exchange, void *context)
{
    clear_area(&g_at_receive);
    for (;;) {
        const int read_status = read_more();
        trace_read(exchange, read_status);
        if (read_status != PUB_ERR_NONE) {
            return read_status;
        }
        if (exchange.m_is_error_first && holds_error()) {
            return PUB_ERR_FAIL;
        }
        const int status = exchange.m_step_ptr == nullptr ? PUB_ERR_NONE : exchange.m_step_ptr(context);
        if (holds(exchange.m_ok_ptr)) {
            return status;
        }
        if (holds_error()) {
            return PUB_ERR_FAIL;
        }
        if (status != PUB_ERR_NONE) {
            return status;
        }
    }
}

} // namespace

void amt_at_clear()
{
    clear_area(&g_at_transmit);
    clear_area(&g_at_receive);
}

void amt_at_set_command(const char *format, ...)
{
    amt_at_clear();
    va_list args;
    va_start(args, format);
    vsnprintf(g_at_transmit.m_text_a, AMT_AT_AREA_SIZE, format, args);
    va_end(args);
    g_at_transmit.m_len = static_cast<uint32_t>(strlen(g_at_transmit.m_text_a));
}

int amt_at_exchange(const amt_at_exchange_st &exchange, void *context, int line)
{
    int status = write_at(g_at_transmit.m_text_a, g_at_transmit.m_len);
    if (status == PUB_ERR_NONE) {
        status = wait_final(exchange, context);
    }
    if (status != PUB_ERR_NONE) {
        pub_log_error({g_amt_handle_log, exchange.m_name_ptr, line}, status);
    }
    return status;
}

std::string_view amt_at_received()
{
    return {g_at_receive.m_text_a, g_at_receive.m_len};
}

void amt_at_remove(uint32_t offset, uint32_t length)
{
    amt_at_area_st &area = g_at_receive;
    const uint32_t rest = area.m_len - offset - length;
    memmove(area.m_text_a + offset, area.m_text_a + offset + length, rest);
    area.m_len = offset + rest;
    memset(area.m_text_a + area.m_len, 0, length);
}

const char *amt_at_find(const char *text)
{
    const size_t offset = amt_at_received().find(text);
    return offset == std::string_view::npos ? nullptr : g_at_receive.m_text_a + offset;
}

int amt_at_get_value(const char *prefix, uint32_t limit, char *dst, uint32_t *length_ptr)
{
    memset(dst, 0, limit + 1);
    *length_ptr = 0;
    std::string_view value = amt_at_received();
    const size_t head = value.find(prefix);
    if (head == std::string_view::npos) {
        return PUB_ERR_FAIL;
    }
    value.remove_prefix(head + strlen(prefix));
    while (!value.empty() && value.front() == ' ') {
        value.remove_prefix(1);
    }
    const size_t end = value.find(AMT_AT_OK);
    if (end == std::string_view::npos) {
        return PUB_ERR_FAIL;
    }
    value.remove_suffix(value.size() - end);
    while (value.size() >= LINE_END.size() && value.substr(value.size() - LINE_END.size()) == LINE_END) {
        value.remove_suffix(LINE_END.size());
    }
    *length_ptr = static_cast<uint32_t>(value.copy(dst, limit));
    return value.size() > limit ? PUB_ERR_FAIL : PUB_ERR_NONE;
}
