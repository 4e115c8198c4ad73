#include "amt/amt-handle/at/at-operand.h"

#include <algorithm>
#include <stdio.h>
#include <string.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr char LINE_END[] = "\r\n";

} // namespace

int handle_amt_get_at_para(const char *prefix, char *out, uint32_t *length_ptr)
{
    if (prefix == nullptr || out == nullptr || length_ptr == nullptr) {
        pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
        pub_log_flags(g_amt_handle_log, {prefix == nullptr, out == nullptr, length_ptr == nullptr});
        return PUB_ERR_PARAM;
    }
    *length_ptr = 0;
    const auto *const text = reinterpret_cast<const char *>(g_handle_context.m_req.m_buf_a);
    const char *start = strstr(text, prefix);
    if (start == nullptr) {
        pub_log_error(g_amt_handle_log, PUB_ERR_FAIL);
        PUB_LOG(g_amt_handle_log, "at cmd[%s] do not include (%s).", text, prefix);
        return PUB_ERR_FAIL;
    }
    start += strlen(prefix);
    start += strspn(start, " ");
    const char *const end = text + strcspn(text, "\r");
    if (end <= start) {
        return PUB_ERR_NONE;
    }
    const size_t line_length = std::min(static_cast<size_t>(end - start), strcspn(start, LINE_END));
    *length_ptr = static_cast<uint32_t>(std::min<size_t>(line_length, AMT_AT_PARA_SIZE));
    memcpy(out, start, *length_ptr);
    return PUB_ERR_NONE;
}

void amt_at_operands_init(amt_at_operands_st *operands_ptr, const char *text)
{
    snprintf(operands_ptr->m_text_a, sizeof(operands_ptr->m_text_a), "%.*s",
             static_cast<int>(strcspn(text, LINE_END)), text);
    operands_ptr->m_next_ptr = nullptr;
    operands_ptr->m_is_started = false;
}

const char *amt_at_operands_next(amt_at_operands_st *operands_ptr)
{
    char *const text = operands_ptr->m_is_started ? nullptr : operands_ptr->m_text_a;
    operands_ptr->m_is_started = true;
    return strtok_r(text, ",", &operands_ptr->m_next_ptr);
}

void amt_at_copy_quoted(const char *text, char *out, uint32_t capacity)
{
    snprintf(out, capacity, "%.*s", static_cast<int>(strcspn(text, "\"\r\n")), text);
}
