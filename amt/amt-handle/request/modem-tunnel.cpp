#include "amt/amt-handle/request/modem-tunnel.h"

#include <string_view>

#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/hex-digit.h"
#include "amt/amt-handle/channel/reply.h"
#include "pub/error.h"

namespace {

constexpr std::string_view COMMAND = "AT^DTTEST=";
constexpr std::string_view ANSWER_PREFIX = "\r\n^DTTEST: ";
constexpr std::string_view LINE_END = "\r\n";
constexpr char g_digit_a[] = "0123456789ABCDEF";

/* The request and the answer as the modem's own blocks. */
amt_buf_st g_raw;
amt_buf_st g_decoded;

struct tunnel_context_st
{
    uint32_t m_channel;
    amt_buf_st *m_rsp_ptr;
};

/* A character that is no digit adds nothing to its half of the byte. */
uint8_t get_nibble(char c)
{
    const int digit = amt_hex_digit(c);
    return static_cast<uint8_t>(digit < 0 ? 0 : digit);
}

/*
 * Decodes the hexadecimal text at offset in the receive area. The block counts one byte for each character of
 * the text, twice what it codes: its second half comes from what follows, and is zero behind the end of the
 * area.
 */
void decode_answer(uint32_t offset, uint32_t length)
{
    amt_handle_clear_buf(&g_decoded);
    g_decoded.m_buf_len = length;
    for (uint32_t i = 0; i < length; i++) {
        const uint32_t pair = offset + 2 * i;
        if (pair >= AMT_AT_AREA_SIZE) {
            break;
        }
        const char *const text = g_at_receive.m_text_a + pair;
        g_decoded.m_buf_a[i] = static_cast<uint8_t>(get_nibble(text[0]) << 4 | get_nibble(text[1]));
    }
}

/* Sends the next whole answer line, if there is one, as a packet and takes it out of the receive area. */
int forward_answer(void *context)
{
    const tunnel_context_st &tunnel = *static_cast<tunnel_context_st *>(context);
    const std::string_view received = amt_at_received();
    const size_t line = received.find(ANSWER_PREFIX);
    if (line == std::string_view::npos) {
        return PUB_ERR_NONE;
    }
    const size_t text = line + ANSWER_PREFIX.size();
    const size_t end = received.find(LINE_END, text);
    if (end == std::string_view::npos) {
        return PUB_ERR_NONE;
    }
    decode_answer(static_cast<uint32_t>(text), static_cast<uint32_t>(end - text));
    amt_at_remove(static_cast<uint32_t>(line), static_cast<uint32_t>(end + LINE_END.size() - line));
    amt_handle_clear_buf(tunnel.m_rsp_ptr);
    const int status = amt_convert_rsp_at_data_2_amt_data(g_decoded.m_buf_a, g_decoded.m_buf_len,
                                                          tunnel.m_rsp_ptr->m_buf_a, AMT_PACKET_SIZE);
    return status == PUB_ERR_NONE ? amt_reply_finish(tunnel.m_channel, tunnel.m_rsp_ptr) : status;
}

constexpr amt_at_exchange_st g_tunnel_exchange = {"amt_modem_handle_req", amt_at_trace_en::NONE,
                                                  AMT_AT_OK_ANYWHERE, false, forward_answer};

/* Puts the command with the raw block as hexadecimal text into the transmit area, whose room has been
 * checked. */
void encode_request()
{
    char *out = g_at_transmit.m_text_a;
    out += COMMAND.copy(out, COMMAND.size());
    for (uint32_t i = 0; i < g_raw.m_buf_len; i++) {
        *out++ = g_digit_a[g_raw.m_buf_a[i] >> 4];
        *out++ = g_digit_a[g_raw.m_buf_a[i] & 0x0F];
    }
    *out++ = '\r';
    g_at_transmit.m_len = static_cast<uint32_t>(out - g_at_transmit.m_text_a);
}

} // namespace

int amt_modem_handle_req(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    const uint32_t checked_channel = channel == 0 ? AMT_CHANNEL_NONE : channel;
    int status = amt_reply_enter_modem(g_amt_handle_log, checked_channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    amt_at_clear();
    amt_handle_clear_buf(&g_raw);
    status = amt_convert_req_amt_data_2_at_data(req_ptr->m_buf_a, g_raw.m_buf_a, AMT_PACKET_SIZE,
                                                &g_raw.m_buf_len);
    if (status != PUB_ERR_NONE) {
        return pub_log_error(g_amt_handle_log, status);
    }
    const uint32_t needed = static_cast<uint32_t>(COMMAND.size()) + 2 + 2 * g_raw.m_buf_len;
    if (needed > AMT_AT_AREA_SIZE - 1) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "(%ld + %ld * 2 + 2) < %d",
                            static_cast<long>(COMMAND.size()), static_cast<long>(g_raw.m_buf_len),
                            static_cast<int>(AMT_AT_AREA_SIZE));
    }
    encode_request();
    tunnel_context_st tunnel = {channel, rsp_ptr};
    return amt_at_exchange(g_tunnel_exchange, &tunnel);
}
