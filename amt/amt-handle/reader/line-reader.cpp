#include "amt/amt-handle/reader/reader.h"

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-log.h"
#include "pub/util/thread-end.h"

ssize_t amt_reader_read(int fd, amt_buf_st *buf_ptr, const char *title)
{
    const ssize_t count =
        amt_wait_read(fd, buf_ptr->m_buf_a + buf_ptr->m_buf_len, AMT_HELD_SIZE - buf_ptr->m_buf_len);
    if (count > 0) {
        buf_ptr->m_buf_len += static_cast<uint32_t>(count);
        pub_log_dump(g_amt_handle_log, title, buf_ptr->m_buf_a, buf_ptr->m_buf_len);
    }
    return count;
}

void amt_reader_rest(const char *text, uint32_t pause_ms)
{
    PUB_LOG(g_amt_handle_log, "WARNING !");
    PUB_LOG(g_amt_handle_log, "%s", text);
    pub_util_sleep_ms(pause_ms);
}

bool amt_reader_is_pc_path_open()
{
    return g_handle_context.m_fd_pc > 0 && g_handle_context.m_fd_modem > 0;
}

void amt_reader_end(std::atomic<int> *fd_ptr, amt_worker_st *worker_ptr)
{
    amt_handle_close_fd(fd_ptr);
    amt_worker_leave(worker_ptr);
    amt_process_end();
}
