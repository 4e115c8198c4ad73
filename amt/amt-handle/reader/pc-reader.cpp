#include "amt/amt-handle/reader/pc-reader.h"

#include <unistd.h>

#include "amt/amt-handle/at/at-command.h"
#include "amt/amt-handle/at/at-probe.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/channel/service-process.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/util/thread-end.h"

namespace {

constexpr uint32_t EMPTY_READ_PAUSE_MS = 100;

/* Whether the loop goes on. */
bool serve_request()
{
    amt_buf_st *const req_ptr = &g_handle_context.m_req;
    if (req_ptr->m_buf_len == 0) {
        pub_log_error(g_amt_handle_log, PUB_ERR_PARAM, "amt_handle_read_pc_loop");
        return false;
    }
    uint32_t id = AMT_ID_NO_PACKET;
    int status = handle_amt_pc_req(&id);
    amt_identity_capture(id);
    if (status == PUB_ERR_NOT_FOUND) {
        status = handle_amt_pc_req_at();
    }
    if (status == PUB_ERR_NONE) {
        amt_handle_clear_buf(req_ptr);
        return true;
    }
    /* The refused request stays in the buffer: what comes next is appended to it. */
    return amt_handle_send_rsp_err(AMT_CHANNEL_PC, &g_handle_context.m_rsp_pc, static_cast<uint8_t>(id + 1),
                                   AMT_RESULT_NOT_SERVED) == PUB_ERR_NONE;
}

/* Reads once and serves what is held then. Returns whether the loop goes on. */
bool read_and_serve()
{
    amt_buf_st *const req_ptr = &g_handle_context.m_req;
    const int fd = g_handle_context.m_fd_pc;
    PUB_LOG(g_amt_handle_log, "read_pc_loop, read ready, m_fd_pc=%d", fd);
    const ssize_t count =
        amt_wait_read(fd, req_ptr->m_buf_a + req_ptr->m_buf_len, AMT_HELD_SIZE - req_ptr->m_buf_len);
    if (count < 0) {
        pub_log_sys_call(g_amt_handle_log, "read");
        return false;
    }
    if (count == 0) {
        PUB_LOG(g_amt_handle_log, "WARNING !");
        PUB_LOG(g_amt_handle_log, "pc read empty data");
        pub_util_sleep_ms(EMPTY_READ_PAUSE_MS);
        return true;
    }
    req_ptr->m_buf_len += static_cast<uint32_t>(count);
    pub_log_dump(g_amt_handle_log, "handle PC req data: ", req_ptr->m_buf_a, req_ptr->m_buf_len);
    if (amt_handshake_pc_data()) {
        amt_handshake_show_success();
    }
    amt_at_probe_rewrite();
    return serve_request();
}

bool is_line_open()
{
    return g_handle_context.m_fd_pc > 0 && g_handle_context.m_fd_modem > 0;
}

} // namespace

void amt_handle_read_pc_loop()
{
    amt_handle_clear_buf(&g_handle_context.m_req);
    amt_handle_clear_buf(&g_handle_context.m_rsp_pc);
    pub_log_entry(g_amt_handle_log);
    while (is_line_open() && read_and_serve()) {
        if (!amt_service_process_is_own()) {
            _exit(0);
        }
    }
    amt_handle_close_fd(&g_handle_context.m_fd_pc);
    amt_worker_leave(&g_handle_context.m_pc_reader);
    amt_process_end();
}
