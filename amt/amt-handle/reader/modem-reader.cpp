#include "amt/amt-handle/reader/reader.h"

#include <errno.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "amt/amt-log.h"

namespace {

constexpr uint32_t EMPTY_READ_PAUSE_MS = 100;

/* Reads once, behind what is held. Returns whether anything came. */
bool read_chunk()
{
    amt_buf_st *const buf_ptr = &g_handle_context.m_modem;
    const int fd = g_handle_context.m_fd_modem;
    PUB_LOG(g_amt_handle_log, "read_modem_loop, read ready, m_fd_modem=%d", fd);
    if (amt_reader_read(fd, buf_ptr, "receive Modem data: ") < 1) {
        amt_reader_rest("modem read empty data", EMPTY_READ_PAUSE_MS);
        return false;
    }
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
    while (amt_reader_is_pc_path_open() && read_and_pass()) {
    }
    amt_reader_end(&g_handle_context.m_fd_modem, &g_handle_context.m_modem_reader);
}
