#pragma once

/* The old names of amt/amt-handle/channel/reply.h, until their last users have moved. */

#include "amt/amt-handle/channel/reply.h"
#include "pub/error.h"

inline int amt_handle_finish_rsp(uint32_t channel, amt_buf_st *rsp_ptr)
{
    return amt_reply_finish(channel, rsp_ptr);
}

inline int amt_handle_check_modem(const char *func = __builtin_FUNCTION(), int line = __builtin_LINE())
{
    return amt_reply_check_modem(g_amt_handle_log, func, line);
}

int amt_handle_check_request(const pub_log_source_st &source, int line, const char *func, uint32_t channel,
                             const amt_buf_st *req_ptr, const amt_buf_st *rsp_ptr);
#define AMT_CHECK_REQUEST(source, channel, req_ptr, rsp_ptr)                                                 \
    amt_handle_check_request(source, __LINE__, __func__, channel, req_ptr, rsp_ptr)
