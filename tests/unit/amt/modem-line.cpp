#include "tests/unit/amt/modem-line.h"

#include <fcntl.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"

namespace {

constexpr unsigned int DEADLINE_SECONDS = 30;

void open_line(int *fd_a)
{
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, fd_a), 0);
    ASSERT_GT(fd_a[0], 0);
}

std::vector<std::string> take_all(int fd)
{
    std::vector<std::string> chunks;
    for (;;) {
        char chunk_a[2 * AMT_PACKET_SIZE];
        const ssize_t count = recv(fd, chunk_a, sizeof(chunk_a), MSG_DONTWAIT);
        if (count <= 0) {
            return chunks;
        }
        chunks.emplace_back(chunk_a, static_cast<size_t>(count));
    }
}

std::string little_endian(uint32_t value, uint32_t size)
{
    std::string bytes;
    for (uint32_t i = 0; i < size; i++) {
        bytes.push_back(static_cast<char>(value >> (8 * i) & 0xFF));
    }
    return bytes;
}

std::string atom(uint8_t id, uint8_t type, const std::string &value)
{
    std::string bytes = {'\xEE', static_cast<char>(id), static_cast<char>(type)};
    return bytes + little_endian(static_cast<uint32_t>(value.size()), 2) + value;
}

} // namespace

modem_line_c::modem_line_c() : m_unreadable_fd(-1)
{
    open_line(m_modem_a);
    open_line(m_app_a);
    open_line(m_pc_a);
    g_handle_context.m_fd_at = m_modem_a[0];
    g_handle_context.m_pty.m_ptm_fd = m_app_a[0];
    g_handle_context.m_fd_pc = m_pc_a[0];
    g_handle_state.m_is_no_modem = 0;
    alarm(DEADLINE_SECONDS);
}

modem_line_c::~modem_line_c()
{
    alarm(0);
    g_handle_context.m_fd_at = 0;
    g_handle_context.m_pty.m_ptm_fd = 0;
    g_handle_context.m_fd_pc = 0;
    g_handle_state.m_is_no_modem = 0;
    for (const int fd : {m_modem_a[0], m_modem_a[1], m_app_a[0], m_app_a[1], m_pc_a[0], m_pc_a[1]}) {
        close(fd);
    }
    if (m_unreadable_fd > 0) {
        close(m_unreadable_fd);
    }
}

void modem_line_c::answer(const std::string &chunk) const
{
    ASSERT_EQ(send(m_modem_a[1], chunk.data(), chunk.size(), MSG_DONTWAIT),
              static_cast<ssize_t>(chunk.size()));
}

void modem_line_c::answer_bytewise(const std::string &text) const
{
    for (const char c : text) {
        answer(std::string(1, c));
    }
}

std::vector<std::string> modem_line_c::commands() const
{
    return take_all(m_modem_a[1]);
}

std::vector<std::string> modem_line_c::app_packets() const
{
    return take_all(m_app_a[1]);
}

std::vector<std::string> modem_line_c::pc_frames() const
{
    return take_all(m_pc_a[1]);
}

size_t modem_line_c::unread_chunks() const
{
    return take_all(m_modem_a[0]).size();
}

int modem_line_c::handle(amt_handle_func handler, const std::string &packet, uint32_t channel) const
{
    amt_buf_st req = {};
    req.m_buf_len =
        static_cast<uint32_t>(packet.copy(reinterpret_cast<char *>(req.m_buf_a), AMT_PACKET_SIZE));
    amt_buf_st rsp;
    memset(rsp.m_buf_a, 0x5A, sizeof(rsp.m_buf_a));
    rsp.m_buf_len = 77;
    return handler(channel, &req, &rsp);
}

void modem_line_c::break_reads()
{
    m_unreadable_fd = open("/dev/null", O_WRONLY | O_CLOEXEC);
    ASSERT_GT(m_unreadable_fd, 0);
    g_handle_context.m_fd_at = m_unreadable_fd;
}

void modem_line_c::close_at() const
{
    g_handle_context.m_fd_at = 0;
}

std::string int_atom(uint8_t id, int32_t value)
{
    return atom(id, 1, little_endian(static_cast<uint32_t>(value), 4));
}

std::string text_atom(uint8_t id, const std::string &text)
{
    return atom(id, 2, text);
}

std::string bytes_atom(uint8_t id, const std::string &bytes)
{
    return atom(id, 3, bytes);
}

std::string byte_atom(uint8_t id, uint8_t value)
{
    return atom(id, 4, std::string(1, static_cast<char>(value)));
}

std::string wire_packet(uint8_t id, const std::string &atoms)
{
    const uint32_t length = static_cast<uint32_t>(atoms.size());
    return little_endian(length + 6, 2) + '\xBB' + static_cast<char>(id) + little_endian(length, 2) + atoms;
}

std::string failure_packet(uint8_t rsp_id)
{
    return wire_packet(rsp_id, int_atom(1, 10));
}
