#include "amt/amt-handle/reader/reader.h"

#include <unistd.h>

#include "amt/amt-handle/at/at-command.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr uint32_t EMPTY_READ_PAUSE_MS = 100;

/* Whether the loop goes on. */
bool serve_request()
{
    amt_buf_st *const req_ptr = &g_handle_context.m_req;
    if (req_ptr->m_buf_len == 0) {
        pub_log_error({g_amt_handle_log, "amt_handle_read_pc_loop"}, PUB_ERR_PARAM);
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
    const ssize_t count = amt_reader_read(fd, req_ptr, "handle PC req data: ");
    if (count < 0) {
        pub_log_sys_call(g_amt_handle_log, "read");
        return false;
    }
    if (count == 0) {
        amt_reader_rest("pc read empty data", EMPTY_READ_PAUSE_MS);
        return true;
    }
    if (amt_handshake_pc_data()) {
        amt_handshake_show_success();
    }
    amt_at_probe_rewrite();
    return serve_request();
}

} // namespace

void amt_handle_read_pc_loop()
{
    amt_handle_clear_buf(&g_handle_context.m_req);
    amt_handle_clear_buf(&g_handle_context.m_rsp_pc);
    pub_log_entry(g_amt_handle_log);
    while (amt_reader_is_pc_path_open() && read_and_serve()) {
        if (amt_service_process_is_child()) {
            _exit(0);
        }
    }
    amt_reader_end(&g_handle_context.m_fd_pc, &g_handle_context.m_pc_reader);
}
