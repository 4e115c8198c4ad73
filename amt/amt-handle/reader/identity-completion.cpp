#include "amt/amt-handle/reader/identity-completion.h"

#include <string.h>

#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/identity-slots.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

/* Whether the modem has answered with a packet that reports success. */
bool is_accepted_by_packet(const amt_buf_st *modem_ptr)
{
    amt_buf_st packet = *modem_ptr;
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

bool is_accepted(const amt_buf_st *modem_ptr)
{
    return strstr(reinterpret_cast<const char *>(modem_ptr->m_buf_a), "\r\nOK\r\n") != nullptr ||
           is_accepted_by_packet(modem_ptr);
}

} // namespace

void amt_identity_complete(const amt_buf_st *modem_ptr)
{
    const int kind = amt_identity_get_pending();
    PUB_LOG(g_amt_handle_log, "g_cur_treat_cmd_type:%d;", kind);
    if ((kind == AMT_IDENTITY_IMEI || kind == AMT_IDENTITY_SN) && is_accepted(modem_ptr)) {
        handle_amt_imei_and_sn_save_file(kind);
        amt_identity_set_pending(AMT_IDENTITY_NONE);
    }
}
