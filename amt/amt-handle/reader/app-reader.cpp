#include "amt/amt-handle/reader/reader.h"

#include <errno.h>
#include <pthread.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr uint32_t EMPTY_READ_PAUSE_MS = 200;

/* The app has closed its side: a new pseudo-terminal waits for its return. Whether there is one. */
bool reopen_pty()
{
    pub_pty_st *const pty_ptr = &g_handle_context.m_pty;
    PUB_LOG(g_amt_handle_log, "pty disconnect: pts name(%s), pts mapping name(%s)", pty_ptr->m_pts_name_a,
            pty_ptr->m_pts_mapping_name_a);
    pub_pty_close(pty_ptr);
    if (pub_pty_open(pty_ptr) == PUB_ERR_NONE) {
        return true;
    }
    pub_pty_close(pty_ptr);
    return false;
}

void give_up_pty()
{
    pub_pty_st *const pty_ptr = &g_handle_context.m_pty;
    pub_log_call_error({g_amt_handle_log, "amt_handle_read_app_loop"}, "read", PUB_ERR_SYS_CALL);
    PUB_LOG(g_amt_handle_log, "pty disconnect: pts name(%s), pts mapping name(%s), thread id(%d), PTM fd(%d)",
            pty_ptr->m_pts_name_a, pty_ptr->m_pts_mapping_name_a, static_cast<int>(gettid()),
            pty_ptr->m_ptm_fd);
    pub_pty_close(pty_ptr);
}

/* Whether the loop goes on after a read that brought nothing. */
bool handle_empty_read(ssize_t count)
{
    if (count == 0) {
        amt_reader_rest("app read empty data", EMPTY_READ_PAUSE_MS);
        return true;
    }
    if (errno == EIO) {
        return reopen_pty();
    }
    give_up_pty();
    return false;
}

bool read_and_serve()
{
    const ssize_t count =
        amt_reader_read(g_handle_context.m_pty.m_ptm_fd, &g_handle_context.m_req, "handle APP req data: ");
    if (count <= 0) {
        return handle_empty_read(count);
    }
    handle_amt_app_req();
    return true;
}

} // namespace

void amt_handle_read_app_loop()
{
    amt_handle_clear_buf(&g_handle_context.m_req);
    amt_handle_clear_buf(&g_handle_context.m_rsp_app);
    pub_log_entry(g_amt_handle_log);
    while (read_and_serve()) {
        if (amt_service_process_is_child()) {
            _exit(0);
        }
    }
    amt_worker_leave(&g_handle_context.m_app_reader);
}
