#include "amt/amt-handle/request/request-frame.h"

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

int amt_request_begin(int line, const char *func, uint32_t channel, const amt_buf_st *req_ptr,
                      const amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_handle_log, func);
    return amt_handle_check_request(g_amt_handle_log, line, func, channel, req_ptr, rsp_ptr);
}

int amt_request_begin_modem(int line, const char *func, uint32_t channel, const amt_buf_st *req_ptr,
                            const amt_buf_st *rsp_ptr)
{
    const int status = amt_request_begin(line, func, channel, req_ptr, rsp_ptr);
    return status == PUB_ERR_NONE ? amt_handle_check_modem() : status;
}

void amt_reply_start(amt_buf_st *rsp_ptr, uint8_t rsp_id)
{
    amt_handle_clear_buf(rsp_ptr);
    amt_packet_init(rsp_ptr->m_buf_a, rsp_id);
}

int amt_reply_finish_ok(uint32_t channel, amt_buf_st *rsp_ptr)
{
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    return amt_handle_finish_rsp(channel, rsp_ptr);
}

int amt_reply_failed(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id)
{
    return amt_handle_send_rsp_err(channel, rsp_ptr, rsp_id, AMT_RESULT_MODEM_FAILED);
}
