#include "tests/unit/amt/modem-pty.h"

#include <fcntl.h>
#include <poll.h>
#include <pty.h>
#include <stdlib.h>
#include <termios.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace {

constexpr int DEADLINE_MS = 10000;

bool is_ready(int fd, int timeout_ms)
{
    pollfd entry = {fd, POLLIN, 0};
    return poll(&entry, 1, timeout_ms) == 1;
}

void open_raw(int *master_fd_ptr, int *slave_fd_ptr)
{
    ASSERT_EQ(openpty(master_fd_ptr, slave_fd_ptr, nullptr, nullptr, nullptr), 0);
    termios attr = {};
    ASSERT_EQ(tcgetattr(*slave_fd_ptr, &attr), 0);
    cfmakeraw(&attr);
    ASSERT_EQ(tcsetattr(*slave_fd_ptr, TCSANOW, &attr), 0);
}

} // namespace

modem_pty_c::modem_pty_c() : m_master_fd(-1), m_slave_fd(-1)
{
    open_raw(&m_master_fd, &m_slave_fd);
}

modem_pty_c::~modem_pty_c()
{
    close(m_master_fd);
    close(m_slave_fd);
}

std::string modem_pty_c::path() const
{
    char name_a[64] = {};
    EXPECT_EQ(ptsname_r(m_master_fd, name_a, sizeof(name_a)), 0);
    return name_a;
}

void modem_pty_c::say(const std::string &text) const
{
    ASSERT_EQ(write(m_master_fd, text.data(), text.size()), static_cast<ssize_t>(text.size()));
}

std::string modem_pty_c::hear(size_t size) const
{
    std::string text;
    while (text.size() < size && is_ready(m_master_fd, DEADLINE_MS)) {
        char chunk_a[4096];
        const size_t wanted = size - text.size();
        const ssize_t count = read(m_master_fd, chunk_a, wanted < sizeof(chunk_a) ? wanted : sizeof(chunk_a));
        if (count <= 0) {
            break;
        }
        text.append(chunk_a, static_cast<size_t>(count));
    }
    EXPECT_EQ(text.size(), size);
    return text;
}

bool modem_pty_c::is_quiet() const
{
    return !is_ready(m_master_fd, 0);
}

int open_lost_tty()
{
    int master_fd = -1;
    int slave_fd = -1;
    open_raw(&master_fd, &slave_fd);
    close(master_fd);
    return slave_fd;
}
