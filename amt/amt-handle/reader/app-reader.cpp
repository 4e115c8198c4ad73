#include "amt/amt-handle/reader/app-reader.h"

#include <errno.h>
#include <pthread.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/service-process.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/util/thread-end.h"

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
    pub_log_sys_call(g_amt_handle_log, "read");
    pub_log_error(g_amt_handle_log, PUB_ERR_SYS_CALL, "amt_handle_read_app_loop");
    PUB_LOG(g_amt_handle_log, "pty disconnect: pts name(%s), pts mapping name(%s), thread id(%d), PTM fd(%d)",
            pty_ptr->m_pts_name_a, pty_ptr->m_pts_mapping_name_a, static_cast<int>(gettid()),
            pty_ptr->m_ptm_fd);
    pub_pty_close(pty_ptr);
}

/* Whether the loop goes on after a read that brought nothing. */
bool handle_empty_read(ssize_t count)
{
    if (count == 0) {
        PUB_LOG(g_amt_handle_log, "WARNING !");
        PUB_LOG(g_amt_handle_log, "app read empty data");
        pub_util_sleep_ms(EMPTY_READ_PAUSE_MS);
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
    amt_buf_st *const req_ptr = &g_handle_context.m_req;
    const ssize_t count =
        amt_wait_read(g_handle_context.m_pty.m_ptm_fd, req_ptr->m_buf_a + req_ptr->m_buf_len,
                      AMT_HELD_SIZE - req_ptr->m_buf_len);
    if (count <= 0) {
        return handle_empty_read(count);
    }
    req_ptr->m_buf_len += static_cast<uint32_t>(count);
    pub_log_dump(g_amt_handle_log, "handle APP req data: ", req_ptr->m_buf_a, req_ptr->m_buf_len);
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
        if (!amt_service_process_is_own()) {
            _exit(0);
        }
    }
    amt_worker_leave(&g_handle_context.m_app_reader);
}
