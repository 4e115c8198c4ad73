#include "amt/amt-handle/at/at-command.h"

#include <errno.h>
#include <stdint.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/tty.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/util/thread-end.h"

namespace {

/* What the modem is given to recover in after a write that went wrong, in milliseconds. */
constexpr uint32_t FAILURE_PAUSE_MS = 20;

int handle_failed_write()
{
    if (errno != EIO && errno != EBADF) {
        PUB_LOG(g_amt_handle_log, "write error 2, errno[%d]", errno);
        return PUB_ERR_FAIL;
    }
    PUB_LOG(g_amt_handle_log, "write error 1, errno[%d]", errno);
    return amt_tty_open_modem();
}

int judge_write(ssize_t written)
{
    const amt_buf_st *const req_ptr = &g_handle_context.m_req;
    if (written == static_cast<ssize_t>(req_ptr->m_buf_len)) {
        return PUB_ERR_NONE;
    }
    const int status = written < 0 ? handle_failed_write() : PUB_ERR_FAIL;
    pub_util_sleep_ms(FAILURE_PAUSE_MS);
    return status;
}

} // namespace

int amt_modem_write_request()
{
    const amt_buf_st *const req_ptr = &g_handle_context.m_req;
    const ssize_t written = write(g_handle_context.m_fd_modem, req_ptr->m_buf_a, req_ptr->m_buf_len);
    const int status = judge_write(written);
    pub_log_dump(g_amt_handle_log, "write to modem: ", req_ptr->m_buf_a,
                 written > 0 ? static_cast<uint32_t>(written) : 0);
    return status;
}
