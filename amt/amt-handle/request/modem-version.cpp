#include "amt/amt-handle/request/version.h"

#include <string.h>
#include <string_view>

#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/channel/hex-digit.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr uint32_t VALUE_LIMIT = 408;
static_assert(VALUE_LIMIT / 2 < AMT_MODEM_VERSION_SIZE);

constexpr amt_at_exchange_st g_version_exchange = {"get_l1_hls_version", amt_at_trace_en::NONE, AMT_AT_OK,
                                                   false, nullptr};

/*
 * Where the hexadecimal text ends. The end marker is looked for in the whole value and at any offset, between
 * two digit pairs too: stations compare with versions that were cut so.
 */
size_t find_end(std::string_view value)
{
    for (const std::string_view marker : {"0a", "0A"}) {
        const size_t end = value.find(marker);
        if (end != std::string_view::npos) {
            return end;
        }
    }
    return value.size();
}

/* The hexadecimal text of a value "anything,text"; empty when the end marker lies before it. Requires a
 * comma. */
std::string_view cut_hex_text(std::string_view value)
{
    size_t start = value.find(',') + 1;
    while (start < value.size() && value[start] == ' ') {
        start++;
    }
    const std::string_view text(value.data() + start, value.size() - start);
    const std::string_view mark = text.substr(0, 2);
    if (mark == "0D" || mark == "0d") {
        start += mark.size();
    }
    const size_t end = find_end(value);
    return end > start ? std::string_view(value.data() + start, end - start) : std::string_view();
}

/* Packs each two digits into a byte; an odd last digit is dropped. Returns the number of bytes. */
uint32_t decode_hex(std::string_view text, uint8_t *out)
{
    uint32_t count = 0;
    int high = -1;
    for (const char c : text) {
        const int digit = amt_hex_digit(c);
        if (digit < 0) {
            continue;
        }
        if (high < 0) {
            high = digit;
            continue;
        }
        out[count++] = static_cast<uint8_t>(high << 4 | digit);
        high = -1;
    }
    return count;
}

} // namespace

int get_l1_hls_version(int32_t type, uint8_t *version, uint32_t *length_ptr)
{
    pub_log_entry(g_amt_handle_log);
    memset(version, 0, AMT_MODEM_VERSION_SIZE);
    *length_ptr = 0;
    amt_at_set_command("AT^DCMR=%d\r", type);
    PUB_LOG(g_amt_handle_log, "will send at command:%s", g_at_transmit.m_text_a);
    if (const int status = amt_at_exchange(g_version_exchange, nullptr); status != PUB_ERR_NONE) {
        return status;
    }
    char value_a[VALUE_LIMIT + 1];
    uint32_t length = 0;
    if (const int status = amt_at_get_value("\r\n^DCMR:", VALUE_LIMIT, value_a, &length);
        status != PUB_ERR_NONE) {
        return pub_log_error(g_amt_handle_log, status);
    }
    if (length == 0) {
        return pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
    }
    const std::string_view value(value_a, length);
    if (value.find(',') == std::string_view::npos) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "DCMR-query's result[%s] is invalid", value_a);
    }
    *length_ptr = decode_hex(cut_hex_text(value), version);
    return PUB_ERR_NONE;
}
