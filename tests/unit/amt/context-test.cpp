#include "amt/amt-handle/channel/context.h"

#include <fcntl.h>
#include <string.h>
#include <thread>
#include <unistd.h>

#include "tests/unit/support/descriptor-swap.h"
#include <gtest/gtest.h>

namespace {

bool is_open(int fd)
{
    return fcntl(fd, F_GETFD) != -1;
}

TEST(context, closes_what_is_open_and_marks_it)
{
    int fd_a[2];
    ASSERT_EQ(pipe2(fd_a, O_CLOEXEC), 0);
    std::atomic<int> fd{fd_a[0]};
    amt_handle_close_fd(&fd);
    EXPECT_FALSE(is_open(fd_a[0]));
    EXPECT_EQ(fd, -1);
    amt_handle_close_fd(&fd);
    EXPECT_TRUE(is_open(fd_a[1]));
    close(fd_a[1]);
}

TEST(context, never_closes_descriptor_0)
{
    ASSERT_TRUE(is_open(STDIN_FILENO));
    for (const int value : {0, -1, -118}) {
        std::atomic<int> fd{value};
        amt_handle_close_fd(&fd);
        EXPECT_EQ(fd, -1);
    }
    EXPECT_TRUE(is_open(STDIN_FILENO));
}

TEST(context, closes_descriptor_1)
{
    bool is_closed = false;
    {
        const descriptor_swap_c swap(STDOUT_FILENO, STDERR_FILENO);
        std::atomic<int> fd{STDOUT_FILENO};
        amt_handle_close_fd(&fd);
        is_closed = !is_open(STDOUT_FILENO);
    }
    EXPECT_TRUE(is_closed);
}

TEST(context, closes_once_for_two_threads)
{
    for (int i = 0; i < 200; i++) {
        int fd_a[2];
        ASSERT_EQ(pipe2(fd_a, O_CLOEXEC), 0);
        std::atomic<int> fd{fd_a[0]};
        std::thread other([&fd] { amt_handle_close_fd(&fd); });
        amt_handle_close_fd(&fd);
        other.join();
        EXPECT_EQ(fd, -1);
        /* A second close would have hit whatever got the number meanwhile. */
        EXPECT_FALSE(is_open(fd_a[0]));
        EXPECT_TRUE(is_open(fd_a[1]));
        close(fd_a[1]);
    }
}

TEST(context, buffer_is_cleared_as_a_whole)
{
    EXPECT_EQ(sizeof(amt_buf_st), 4100U);
    amt_buf_st buf;
    memset(&buf, 0xA5, sizeof(buf));
    amt_handle_clear_buf(&buf);
    static const amt_buf_st zero = {};
    EXPECT_EQ(memcmp(&buf, &zero, sizeof(buf)), 0);
}

TEST(context, is_cleared_as_a_whole)
{
    g_handle_context.m_fd_pc = 1000;
    g_handle_context.m_fd_at = 1001;
    g_handle_context.m_fd_modem = 1002;
    g_handle_context.m_pty.m_ptm_fd = 1003;
    g_handle_context.m_req.m_buf_len = 7;
    g_handle_context.m_modem.m_buf_a[4095] = 7;
    g_handle_context.m_handle_pc_func_a[254] = [](uint32_t, amt_buf_st *, amt_buf_st *) { return 0; };
    amt_handle_clear_context();
    EXPECT_EQ(g_handle_context.m_fd_pc, 0);
    EXPECT_EQ(g_handle_context.m_fd_at, 0);
    EXPECT_EQ(g_handle_context.m_fd_modem, 0);
    EXPECT_EQ(g_handle_context.m_pty.m_ptm_fd, 0);
    EXPECT_EQ(g_handle_context.m_req.m_buf_len, 0U);
    EXPECT_EQ(g_handle_context.m_modem.m_buf_a[4095], 0);
    EXPECT_EQ(g_handle_context.m_handle_pc_func_a[254], nullptr);
    EXPECT_EQ(g_handle_context.m_app_reader.m_id.load(), 0U);
}

} // namespace
