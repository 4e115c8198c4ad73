#include "amt/amt-handle/reader/identity-capture.h"

#include <stdlib.h>
#include <string.h>

#include "amt/amt-command.h"
#include "amt/amt-handle/at/at-operand.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/identity-slots.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"

namespace {

constexpr uint32_t SWITCH_CHANNEL_CMD = 232;
constexpr uint8_t ATOM_IMEI = 21;
constexpr uint8_t ATOM_BOARD = 38;
constexpr uint8_t ATOM_CHANNEL = 159;

constexpr char CHANNEL_PREFIX[] = "AT^DMPCHN=";

/* The AT texts that write an identity, in the order in which they are looked for. */
struct text_capture_st
{
    const char *m_prefix_ptr;
    int m_kind;
};
constexpr text_capture_st g_text_capture_a[] = {
    {"AT^DCGSNW=", AMT_IDENTITY_IMEI},
    {"AT^DMSN=", AMT_IDENTITY_SN},
};

const char *get_request_text()
{
    return reinterpret_cast<const char *>(g_handle_context.m_req.m_buf_a);
}

void capture_text(const text_capture_st &capture)
{
    PUB_LOG(g_amt_handle_log, "received at command in amt4:%s", get_request_text());
    char text_a[AMT_AT_PARA_SIZE + 1] = {};
    uint32_t length = 0;
    const int status = handle_amt_get_at_para(capture.m_prefix_ptr, text_a, &length);
    amt_identity_set_text(capture.m_kind, text_a, length);
    PUB_LOG(g_amt_handle_log, "getted parameter:%s. prefix:%s; rtn:%d.", text_a, capture.m_prefix_ptr,
            status);
    amt_identity_set_pending(capture.m_kind);
}

void capture_text_channel()
{
    char text_a[AMT_AT_PARA_SIZE + 1] = {};
    uint32_t length = 0;
    handle_amt_get_at_para(CHANNEL_PREFIX, text_a, &length);
    amt_identity_set_channel(static_cast<uint8_t>(atoi(text_a)));
}

/* Whether the request's text is about an identity. */
bool capture_from_text()
{
    for (const text_capture_st &capture : g_text_capture_a) {
        if (strstr(get_request_text(), capture.m_prefix_ptr) != nullptr) {
            capture_text(capture);
            return true;
        }
    }
    if (strstr(get_request_text(), CHANNEL_PREFIX) != nullptr) {
        capture_text_channel();
        return true;
    }
    return false;
}

void capture_atom(uint8_t atom_id, int kind, char *text)
{
    const uint32_t length =
        amt_packet_get_string(g_handle_context.m_pc.m_buf_a, atom_id, text, AMT_IDENTITY_TEXT_SIZE);
    amt_identity_set_text(kind, text, length);
    amt_identity_set_pending(kind);
}

void capture_from_packet(uint32_t id)
{
    char text_a[AMT_IDENTITY_TEXT_SIZE + 1] = {};
    if (id == AMT_WRITE_BOARD_CMD) {
        capture_atom(ATOM_BOARD, AMT_IDENTITY_SN, text_a);
        PUB_LOG(g_amt_handle_log, "getted write-board command in amt1: board:%s;", text_a);
    } else if (id == SWITCH_CHANNEL_CMD) {
        const int32_t channel = amt_packet_get_int(g_handle_context.m_pc.m_buf_a, ATOM_CHANNEL);
        amt_identity_set_channel(static_cast<uint8_t>(channel));
        PUB_LOG(g_amt_handle_log, "getted switch-channel command in amt1: channel:%d;", channel);
    } else if (id == AMT_WRITEIMEI_CMD) {
        capture_atom(ATOM_IMEI, AMT_IDENTITY_IMEI, text_a);
        PUB_LOG(g_amt_handle_log, "getted write-imei command in amt1: imei:%s;", text_a);
    }
}

bool may_write_identity(uint32_t id)
{
    return id == AMT_NONE_CMD || id == AMT_WRITEIMEI_CMD || id == AMT_WRITE_BOARD_CMD ||
           id == SWITCH_CHANNEL_CMD || id == AMT_ID_NO_PACKET;
}

} // namespace

void amt_identity_capture(uint32_t id)
{
    PUB_LOG(g_amt_handle_log, "handle_amt_imei_and_sn--->req_id_en:%u.", id);
    if (may_write_identity(id) && !capture_from_text()) {
        capture_from_packet(id);
    }
}
