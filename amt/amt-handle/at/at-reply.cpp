#include "amt/amt-handle/at/at-handler.h"

#include <stdarg.h>
#include <stdio.h>
#include <string.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/reply.h"

int amt_at_reply_ok()
{
    return amt_at_reply("\r\nOK\r\n");
}

int amt_at_reply_error()
{
    return amt_at_reply("\r\nERROR\r\n");
}

int amt_at_reply_cme()
{
    return amt_at_reply("\r\n+CME ERROR: 100\r\n");
}

int amt_at_reply(const char *format, ...)
{
    amt_buf_st *const rsp_ptr = &g_handle_context.m_rsp_pc;
    amt_handle_clear_buf(rsp_ptr);
    auto *const text = reinterpret_cast<char *>(rsp_ptr->m_buf_a);
    va_list args;
    va_start(args, format);
    vsnprintf(text, sizeof(rsp_ptr->m_buf_a), format, args);
    va_end(args);
    rsp_ptr->m_buf_len = static_cast<uint32_t>(strlen(text));
    return amt_handle_send_rsp(AMT_CHANNEL_PC, rsp_ptr);
}
