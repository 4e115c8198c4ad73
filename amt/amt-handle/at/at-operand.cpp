#include "amt/amt-handle/at/at-operand.h"

#include <algorithm>
#include <stdio.h>
#include <string.h>
#include <string_view>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr char LINE_END[] = "\r\n";
constexpr std::string_view LINE_OR_TEXT_END{"\r\n\0", 3};

} // namespace

int handle_amt_get_at_para(const char *prefix, char *out, uint32_t *length_ptr)
{
    if (prefix == nullptr || out == nullptr || length_ptr == nullptr) {
        return pub_log_bad_param(g_amt_handle_log,
                                 {prefix == nullptr, out == nullptr, length_ptr == nullptr});
    }
    *length_ptr = 0;
    const std::string_view text = amt_handle_get_text(g_handle_context.m_req);
    const size_t found = text.find(prefix);
    if (found == std::string_view::npos) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "at cmd[%s] do not include (%s).", text.data(),
                            prefix);
    }
    const size_t start = std::min(text.find_first_not_of(' ', found + strlen(prefix)), text.size());
    const size_t end = std::min(text.find('\r'), text.size());
    if (end <= start) {
        return PUB_ERR_NONE;
    }
    const std::string_view line{text.data() + start, end - start};
    const std::string_view parameter = line.substr(0, line.find_first_of(LINE_OR_TEXT_END));
    *length_ptr = static_cast<uint32_t>(parameter.copy(out, AMT_AT_PARA_SIZE));
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
