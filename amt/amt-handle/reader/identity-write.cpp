#include "amt/amt-handle/reader/identity-write.h"

#include <mutex>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <string_view>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-handle/at/at-operand.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "pub/util/mutex.h"

namespace {

/* What a write is about. The log shows the numbers. */
enum class identity_en : int
{
    NONE = 0,
    IMEI = 1,
    SN = 2 /* the serial number, or the text of a board write */
};

/* Room for a captured text: 20 characters and the terminator. */
constexpr uint32_t TEXT_SIZE = AMT_AT_PARA_SIZE + 1;

/* The modem channel whose texts have files of their own; every other value is the first channel. */
constexpr uint8_t SECOND_CHANNEL = 1;

constexpr char CHANNEL_PREFIX[] = "AT^DMPCHN=";

/* The write that waits for the modem's answer. */
struct pending_st
{
    identity_en m_kind;
    uint8_t m_channel;
    char m_text_a[TEXT_SIZE];
};

pub_mutex_c g_lock;
pending_st g_pending;

/* One kind of identity: the AT text that writes it, what the log calls it, and its file on either channel. */
struct identity_st
{
    identity_en m_kind;
    const char *m_prefix_ptr;
    const char *m_name_ptr;
    const char *m_path_ptr;
    const char *m_second_path_ptr;
};

/* In the order in which the texts are looked for. */
constexpr identity_st g_identity_a[] = {
    {identity_en::IMEI, "AT^DCGSNW=", "imei", "/amt/imei.txt", "/amt/imei-2.txt"},
    {identity_en::SN, "AT^DMSN=", "sn", "/amt/sn.txt", AMT_PCBA_SN_FILE},
};

void set_pending(identity_en kind, const char *text)
{
    const std::lock_guard<pub_mutex_c> guard(g_lock);
    g_pending.m_kind = kind;
    snprintf(g_pending.m_text_a, TEXT_SIZE, "%.*s", static_cast<int>(TEXT_SIZE - 1), text);
}

void set_channel(int32_t channel)
{
    const std::lock_guard<pub_mutex_c> guard(g_lock);
    g_pending.m_channel = static_cast<uint8_t>(channel);
}

/* The pending write at this moment. */
pending_st get_pending()
{
    const std::lock_guard<pub_mutex_c> guard(g_lock);
    return g_pending;
}

/* What stands behind the prefix in the held request, terminated, in text_ptr (TEXT_SIZE bytes). */
int get_parameter(const char *prefix, char *text_ptr)
{
    memset(text_ptr, 0, TEXT_SIZE);
    uint32_t length = 0;
    return handle_amt_get_at_para(prefix, text_ptr, &length);
}

void capture_text(const identity_st &identity)
{
    PUB_LOG(g_amt_handle_log, "received at command in amt4:%s",
            reinterpret_cast<const char *>(g_handle_context.m_req.m_buf_a));
    char text_a[TEXT_SIZE];
    const int status = get_parameter(identity.m_prefix_ptr, text_a);
    PUB_LOG(g_amt_handle_log, "getted parameter:%s. prefix:%s; rtn:%d.", text_a, identity.m_prefix_ptr,
            status);
    set_pending(identity.m_kind, text_a);
}

/* Whether the request's text is about an identity. */
bool capture_from_text()
{
    const std::string_view text = amt_handle_get_text(g_handle_context.m_req);
    for (const identity_st &identity : g_identity_a) {
        if (text.find(identity.m_prefix_ptr) != std::string_view::npos) {
            capture_text(identity);
            return true;
        }
    }
    if (text.find(CHANNEL_PREFIX) == std::string_view::npos) {
        return false;
    }
    char text_a[TEXT_SIZE];
    get_parameter(CHANNEL_PREFIX, text_a);
    set_channel(atoi(text_a));
    return true;
}

void capture_from_packet(uint32_t id)
{
    const uint8_t *const packet = g_handle_context.m_pc.m_buf_a;
    char text_a[TEXT_SIZE + 1] = {}; /* a text of exactly TEXT_SIZE comes without its terminator */
    if (id == AMT_WRITE_BOARD_CMD) {
        amt_packet_get_string(packet, AMT_ATOM_BOARD, text_a, TEXT_SIZE);
        PUB_LOG(g_amt_handle_log, "getted write-board command in amt1: board:%s;", text_a);
        set_pending(identity_en::SN, text_a);
    } else if (id == AMT_SWITCH_CHANNEL_CMD) {
        const int32_t channel = amt_packet_get_int(packet, AMT_ATOM_MODEM_CHANNEL);
        set_channel(channel);
        PUB_LOG(g_amt_handle_log, "getted switch-channel command in amt1: channel:%d;", channel);
    } else if (id == AMT_WRITEIMEI_CMD) {
        amt_packet_get_string(packet, AMT_ATOM_IMEI, text_a, TEXT_SIZE);
        PUB_LOG(g_amt_handle_log, "getted write-imei command in amt1: imei:%s;", text_a);
        set_pending(identity_en::IMEI, text_a);
    }
}

bool may_write_identity(uint32_t id)
{
    return id == AMT_NONE_CMD || id == AMT_WRITEIMEI_CMD || id == AMT_WRITE_BOARD_CMD ||
           id == AMT_SWITCH_CHANNEL_CMD || id == AMT_ID_NO_PACKET;
}

/* Whether the modem has answered with a packet that reports success. */
bool is_accepted_by_packet(const amt_buf_st &modem)
{
    amt_buf_st packet = modem;
    if (amt_convert_pc_2_app(&packet) != PUB_ERR_NONE) {
        return false;
    }
    const uint8_t id = amt_packet_get_cmd(packet.m_buf_a);
    if (id != AMT_WRITEIMEI_RSPCMD && id != AMT_WRITE_BOARD_RSPCMD) {
        return false;
    }
    const int32_t result = amt_packet_get_int(packet.m_buf_a, AMT_ATOM_RESULT);
    PUB_LOG(g_amt_handle_log, "getted error-code from modem: err-code:%d;", result);
    return result == 0;
}

bool is_accepted(const amt_buf_st &modem)
{
    return amt_handle_get_text(modem).find("\r\nOK\r\n") != std::string_view::npos ||
           is_accepted_by_packet(modem);
}

/* The captured value goes to its file: the write as it was when the modem accepted it. */
int handle_amt_imei_and_sn_save_file(const identity_st &identity, const pending_st &write)
{
    pub_log_entry(g_amt_handle_log);
    if (write.m_text_a[0] == '\0') {
        return PUB_ERR_NONE;
    }
    const int status = amt_write_pcba_sn(
        write.m_text_a, write.m_channel == SECOND_CHANNEL ? identity.m_second_path_ptr : identity.m_path_ptr);
    PUB_LOG(g_amt_handle_log, "save %s to file. channel:%d; content:%s;", identity.m_name_ptr,
            write.m_channel, write.m_text_a);
    if (status != PUB_ERR_NONE) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "write %s error.", identity.m_name_ptr);
    }
    PUB_LOG(g_amt_handle_log, "Writed %s to file success.", identity.m_name_ptr);
    return PUB_ERR_NONE;
}

/* The write is not pending any more, unless it has been replaced meanwhile. */
void clear_pending(const pending_st &write)
{
    const std::lock_guard<pub_mutex_c> guard(g_lock);
    if (g_pending.m_kind == write.m_kind && strcmp(g_pending.m_text_a, write.m_text_a) == 0) {
        g_pending.m_kind = identity_en::NONE;
    }
}

} // namespace

void amt_identity_reset()
{
    const std::lock_guard<pub_mutex_c> guard(g_lock);
    g_pending = {};
}

void amt_identity_capture(uint32_t id)
{
    PUB_LOG(g_amt_handle_log, "handle_amt_imei_and_sn--->req_id_en:%u.", id);
    if (may_write_identity(id) && !capture_from_text()) {
        capture_from_packet(id);
    }
}

void amt_identity_complete(const amt_buf_st *modem_ptr)
{
    const pending_st write = get_pending();
    PUB_LOG(g_amt_handle_log, "g_cur_treat_cmd_type:%d;", static_cast<int>(write.m_kind));
    for (const identity_st &identity : g_identity_a) {
        if (identity.m_kind == write.m_kind && is_accepted(*modem_ptr)) {
            handle_amt_imei_and_sn_save_file(identity, write);
            clear_pending(write);
        }
    }
}
