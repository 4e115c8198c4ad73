#include "amt/amt-handle/channel/reply.h"

#include <string.h>
#include <unistd.h>

#include "amt/amt-atom.h"
#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

/*
 * The ready-made frame that tells the station its request has arrived: an envelope without a packet. Stations
 * compare it byte by byte, so it is never computed.
 */
constexpr uint8_t g_pre_rsp_a[] = {0xAA, 0xBB, 0xCC, 0xDD, 0x08, 0x00, 0x00, 0x00,
                                   0x02, 0x02, 0x00, 0x00, 0x76, 0x4A, 0xEE, 0x1D};

bool is_no_channel(uint32_t channel)
{
    const uint32_t low_byte = channel & 0xFF;
    return low_byte == 0 || low_byte == AMT_CHANNEL_NONE;
}

int get_fd(uint32_t channel)
{
    return channel == AMT_CHANNEL_PC ? g_handle_context.m_fd_pc.load() : g_handle_context.m_pty.m_ptm_fd;
}

/* The faults that each sender looks for first, in the calling sender's name. */
int check_sender(uint32_t channel, const amt_buf_st *rsp_ptr,
                 const pub_log_place_st &place = g_amt_handle_log)
{
    if (!is_no_channel(channel) && rsp_ptr != nullptr) {
        return PUB_ERR_NONE;
    }
    return pub_log_bad_param(place, {is_no_channel(channel), rsp_ptr == nullptr});
}

int send_result(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id, int32_t code,
                const pub_log_place_st &place = g_amt_handle_log)
{
    if (check_sender(channel, rsp_ptr, place) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, rsp_id);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, code);
    return amt_reply_finish(channel, rsp_ptr);
}

int write_rsp(int fd, const amt_buf_st *rsp_ptr)
{
    const ssize_t written = write(fd, rsp_ptr->m_buf_a, rsp_ptr->m_buf_len);
    if (written < 0) {
        return pub_log_call_error({g_amt_handle_log, "amt_handle_send_rsp"}, "write", PUB_ERR_FILE);
    }
    if (written != static_cast<ssize_t>(rsp_ptr->m_buf_len)) {
        pub_log_fail({g_amt_handle_log, "amt_handle_send_rsp"}, PUB_ERR_INCOMPLETE, "WARNING !");
        PUB_LOG(g_amt_handle_log, "write not completed: to write(%u) != written(%zd)", rsp_ptr->m_buf_len,
                written);
        return PUB_ERR_INCOMPLETE;
    }
    return PUB_ERR_NONE;
}

} // namespace

int amt_reply_check(const pub_log_place_st &place, uint32_t channel, const amt_buf_st *req_ptr,
                    const amt_buf_st *rsp_ptr)
{
    const bool is_channel_none = channel == AMT_CHANNEL_NONE;
    const bool is_req_empty = req_ptr != nullptr && req_ptr->m_buf_len == 0;
    if (!is_channel_none && req_ptr != nullptr && !is_req_empty && rsp_ptr != nullptr) {
        return PUB_ERR_NONE;
    }
    return pub_log_bad_param(place, {is_channel_none, req_ptr == nullptr, is_req_empty, rsp_ptr == nullptr});
}

int amt_reply_enter(const pub_log_place_st &place, uint32_t channel, const amt_buf_st *req_ptr,
                    const amt_buf_st *rsp_ptr)
{
    pub_log_entry(place.m_source, place.m_func_ptr);
    return amt_reply_check(place, channel, req_ptr, rsp_ptr);
}

int amt_reply_enter_modem(const pub_log_place_st &place, uint32_t channel, const amt_buf_st *req_ptr,
                          const amt_buf_st *rsp_ptr)
{
    const int status = amt_reply_enter(place, channel, req_ptr, rsp_ptr);
    return status == PUB_ERR_NONE ? amt_reply_check_modem(place) : status;
}

int amt_reply_check_modem(const pub_log_place_st &place)
{
    if (g_handle_state.m_is_no_modem == 0) {
        return PUB_ERR_NONE;
    }
    pub_log_fail(place, PUB_ERR_NO_MODEM, "WARNING !");
    PUB_LOG(place.m_source, "no CP.");
    return PUB_ERR_NO_MODEM;
}

void amt_reply_start(amt_buf_st *rsp_ptr, uint8_t rsp_id)
{
    rsp_ptr->m_buf_len = 0;
    amt_packet_init(rsp_ptr->m_buf_a, rsp_id); /* clears the rest */
}

int amt_reply_finish(uint32_t channel, amt_buf_st *rsp_ptr)
{
    const int status = channel == AMT_CHANNEL_PC ? amt_convert_app_2_pc(rsp_ptr) : PUB_ERR_NONE;
    return status == PUB_ERR_NONE ? amt_handle_send_rsp(channel, rsp_ptr) : status;
}

int amt_reply_finish_ok(uint32_t channel, amt_buf_st *rsp_ptr)
{
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    return amt_reply_finish(channel, rsp_ptr);
}

int amt_reply_fail(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id)
{
    return amt_handle_send_rsp_err(channel, rsp_ptr, rsp_id, AMT_RESULT_MODEM_FAILED);
}

int amt_handle_send_rsp(uint32_t channel, amt_buf_st *rsp_ptr)
{
    if (check_sender(channel, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    if (rsp_ptr->m_buf_len == 0) {
        rsp_ptr->m_buf_len = amt_packet_get_length(rsp_ptr->m_buf_a);
    }
    if (rsp_ptr->m_buf_len == 0 || rsp_ptr->m_buf_len > sizeof(rsp_ptr->m_buf_a)) {
        return pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
    }
    const int fd = get_fd(channel);
    if (fd <= 0) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "invalid fd");
    }
    if (const int status = write_rsp(fd, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    pub_log_dump(g_amt_handle_log,
                 channel == AMT_CHANNEL_PC ? "send PC rsp data: " : "send APP rsp data: ", rsp_ptr->m_buf_a,
                 rsp_ptr->m_buf_len);
    amt_handle_clear_buf(rsp_ptr);
    return PUB_ERR_NONE;
}

int amt_handle_send_rsp_ok(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id)
{
    return send_result(channel, rsp_ptr, rsp_id, 0);
}

int amt_handle_send_rsp_err(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id, int32_t code)
{
    return send_result(channel, rsp_ptr, rsp_id, code);
}

int amt_handle_send_pre_rsp_for_pc(uint32_t channel, amt_buf_st *rsp_ptr)
{
    if (channel != AMT_CHANNEL_PC || rsp_ptr == nullptr) {
        return pub_log_bad_param(g_amt_handle_log, {channel != AMT_CHANNEL_PC, rsp_ptr == nullptr});
    }
    amt_handle_clear_buf(rsp_ptr);
    memcpy(rsp_ptr->m_buf_a, g_pre_rsp_a, sizeof(g_pre_rsp_a));
    rsp_ptr->m_buf_len = sizeof(g_pre_rsp_a);
    return amt_handle_send_rsp(channel, rsp_ptr);
}
