#include "amt/amt-handle/reader/modem-reader.h"

#include <errno.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/service-process.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "amt/amt-log.h"
#include "pub/util/thread-end.h"

namespace {

constexpr uint32_t EMPTY_READ_PAUSE_MS = 100;

/* Reads once, behind what is held. Returns whether anything came. */
bool read_chunk()
{
    amt_buf_st *const buf_ptr = &g_handle_context.m_modem;
    const int fd = g_handle_context.m_fd_modem;
    PUB_LOG(g_amt_handle_log, "read_modem_loop, read ready, m_fd_modem=%d", fd);
    const ssize_t count =
        amt_wait_read(fd, buf_ptr->m_buf_a + buf_ptr->m_buf_len, AMT_HELD_SIZE - buf_ptr->m_buf_len);
    if (count < 1) {
        PUB_LOG(g_amt_handle_log, "WARNING !");
        PUB_LOG(g_amt_handle_log, "modem read empty data");
        pub_util_sleep_ms(EMPTY_READ_PAUSE_MS);
        return false;
    }
    buf_ptr->m_buf_len += static_cast<uint32_t>(count);
    pub_log_dump(g_amt_handle_log, "receive Modem data: ", buf_ptr->m_buf_a, buf_ptr->m_buf_len);
    return true;
}

/* Whether the PC took all of it. */
bool pass_to_pc()
{
    amt_buf_st *const buf_ptr = &g_handle_context.m_modem;
    const ssize_t written = write(g_handle_context.m_fd_pc, buf_ptr->m_buf_a, buf_ptr->m_buf_len);
    PUB_LOG(g_amt_handle_log, "write to pc, m_buf_len=%u, write_len=%zd", buf_ptr->m_buf_len, written);
    if (written != static_cast<ssize_t>(buf_ptr->m_buf_len)) {
        if (written < 0) {
            PUB_LOG(g_amt_handle_log, "write error, errno[%d]", errno);
        }
        return false;
    }
    amt_handle_clear_buf(buf_ptr);
    return true;
}

bool is_line_open()
{
    return g_handle_context.m_fd_pc >= 1 && g_handle_context.m_fd_modem >= 1;
}

/* Whether the loop goes on. */
bool read_and_pass()
{
    if (!read_chunk()) {
        return true;
    }
    amt_identity_complete(&g_handle_context.m_modem);
    if (!pass_to_pc()) {
        return false;
    }
    amt_handshake_modem_data();
    return true;
}

} // namespace

void amt_handle_read_modem_loop()
{
    amt_handle_clear_buf(&g_handle_context.m_modem);
    pub_log_entry(g_amt_handle_log);
    while (is_line_open() && read_and_pass()) {
        if (!amt_service_process_is_own()) {
            _exit(0);
        }
    }
    amt_handle_close_fd(&g_handle_context.m_fd_modem);
    amt_worker_leave(&g_handle_context.m_modem_reader);
    amt_process_end();
}
