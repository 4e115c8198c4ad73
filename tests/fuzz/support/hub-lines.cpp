#include "tests/fuzz/support/hub-lines.h"

#include <sys/socket.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "tests/fuzz/support/input.h"

namespace {

constexpr size_t MOST_BYTES = 16384;

/* The near end becomes the hub's. */
int open_pair(std::atomic<int> *near_ptr)
{
    int pair_a[2];
    FUZZ_REQUIRE(socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_NONBLOCK | SOCK_CLOEXEC, 0, pair_a) == 0);
    *near_ptr = pair_a[0];
    return pair_a[1];
}

void say(int fd, const std::string &text)
{
    FUZZ_REQUIRE(send(fd, text.data(), text.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(text.size()));
}

std::optional<std::string> hear(int fd)
{
    static char piece_a[MOST_BYTES];
    const ssize_t count = recv(fd, piece_a, sizeof(piece_a), MSG_DONTWAIT);
    if (count < 0) {
        return std::nullopt;
    }
    FUZZ_REQUIRE(static_cast<size_t>(count) < sizeof(piece_a));
    return std::string(piece_a, static_cast<size_t>(count));
}

} // namespace

hub_lines_c::hub_lines_c()
    : m_pc_fd(open_pair(&g_handle_context.m_fd_pc)), m_modem_fd(open_pair(&g_handle_context.m_fd_modem))
{
}

hub_lines_c::~hub_lines_c()
{
    amt_handle_close_fd(&g_handle_context.m_fd_pc);
    amt_handle_close_fd(&g_handle_context.m_fd_modem);
    close(m_pc_fd);
    close(m_modem_fd);
}

void hub_lines_c::say_pc(const std::string &text)
{
    say(m_pc_fd, text);
    be_silent();
}

void hub_lines_c::say_modem(const std::string &text)
{
    say(m_modem_fd, text);
    say(m_modem_fd, "");
}

void hub_lines_c::be_silent()
{
    say(m_pc_fd, "");
}

std::optional<std::string> hub_lines_c::heard_by_pc()
{
    return hear(m_pc_fd);
}

std::optional<std::string> hub_lines_c::heard_by_modem()
{
    return hear(m_modem_fd);
}
