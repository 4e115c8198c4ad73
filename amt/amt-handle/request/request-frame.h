#pragma once

/* The old names of amt/amt-handle/channel/reply.h, until their last users have moved. */

#include "amt/amt-handle/channel/response.h"

#define AMT_BEGIN_REQUEST(channel, req_ptr, rsp_ptr)                                                         \
    amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr, __func__, __LINE__)
#define AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr)                                                   \
    amt_reply_enter_modem(g_amt_handle_log, channel, req_ptr, rsp_ptr, __func__, __LINE__)

inline int amt_reply_failed(uint32_t channel, amt_buf_st *rsp_ptr, uint8_t rsp_id)
{
    return amt_reply_fail(channel, rsp_ptr, rsp_id);
}
