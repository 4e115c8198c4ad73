#include "amt/amt-handle/channel/tty.h"

#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/util/util.h"

namespace {

constexpr int32_t PAUSE_MS = 1000;

/* Only a UART has a speed; the modem may also hang on a USB or a virtual tty. */
constexpr char UART_PREFIX[] = "/dev/ttyS";

/*
 * Puts a new tty in an old one's place. The descriptor keeps its number: another thread may be about to read
 * from it, and would read from a stranger that got the number after a close.
 */
void replace_tty(std::atomic<int> *fd_ptr, int fd)
{
    const int old_fd = *fd_ptr;
    if (old_fd > 0 && dup3(fd, old_fd, O_CLOEXEC) == old_fd) {
        close(fd);
        return;
    }
    *fd_ptr = fd;
}

bool is_uart(const char *path)
{
    return strncmp(path, UART_PREFIX, sizeof(UART_PREFIX) - 1) == 0;
}

} // namespace

int amt_tty_open(std::atomic<int> *fd_ptr, const char *path, int32_t attempts)
{
    int fd = -1;
    const int status =
        pub_util_try_to_open_device(&fd, path, O_RDWR | O_NOCTTY | O_CLOEXEC, attempts, PAUSE_MS);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    replace_tty(fd_ptr, fd);
    return PUB_ERR_NONE;
}

int amt_tty_open_modem()
{
    const int status = amt_tty_open(&g_handle_context.m_fd_modem, g_amt_cfg.m_tty_modem_a, AMT_TTY_ATTEMPTS);
    PUB_LOG(
        g_amt_handle_log,
        "pub_util_try_to_open_device, handle_context_st.m_fd_modem  = %d, amt_cfg_st.m_tty_modem_a = %s\n",
        g_handle_context.m_fd_modem.load(), g_amt_cfg.m_tty_modem_a);
    if (status == PUB_ERR_NONE) {
        amt_tty_set_modem_speed(g_amt_cfg.m_modem_uart_amt_baudrate);
    }
    return status;
}

int amt_tty_open_at()
{
    return amt_tty_open(&g_handle_context.m_fd_at, g_amt_cfg.m_tty_at_mux_a, AMT_TTY_AT_ATTEMPTS);
}

void amt_tty_set_modem_speed(int32_t speed)
{
    if (is_uart(g_amt_cfg.m_tty_modem_a)) {
        pub_util_set_serial_dev_attr(g_handle_context.m_fd_modem, speed);
    }
}
