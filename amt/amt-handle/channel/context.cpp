#include "amt/amt-handle/channel/context.h"

#include <new>
#include <string.h>
#include <unistd.h>

handle_context_st g_handle_context;
handle_state_st g_handle_state;
int32_t g_usb_activate = 0;

void amt_handle_clear_context()
{
    new (&g_handle_context) handle_context_st();
}

void amt_handle_clear_buf(amt_buf_st *buf_ptr)
{
    memset(buf_ptr, 0, sizeof(*buf_ptr));
}

std::string_view amt_handle_get_text(const amt_buf_st &buf)
{
    return {reinterpret_cast<const char *>(buf.m_buf_a), buf.m_buf_len};
}

void amt_handle_close_fd(std::atomic<int> *fd_ptr)
{
    const int fd = fd_ptr->exchange(-1);
    if (fd > 0) {
        close(fd);
    }
}
