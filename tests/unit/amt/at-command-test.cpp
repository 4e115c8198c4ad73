#include "amt/amt-handle/at/at-command.h"

#include <errno.h>
#include <string>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

const std::string OK = "\r\nOK\r\n";
const std::string ERROR = "\r\nERROR\r\n";

/* The PC's line and the modem's data line, with somebody at their far ends. */
class at_command : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_EQ(socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, m_modem_a), 0);
        g_handle_context.m_fd_modem = m_modem_a[0];
    }
    void TearDown() override
    {
        g_handle_context.m_fd_modem = 0;
        amt_handle_clear_buf(&g_handle_context.m_req);
        close(m_modem_a[0]);
        close(m_modem_a[1]);
    }

    static int serve(const std::string &text)
    {
        amt_handle_clear_buf(&g_handle_context.m_req);
        g_handle_context.m_req.m_buf_len =
            static_cast<uint32_t>(text.copy(reinterpret_cast<char *>(g_handle_context.m_req.m_buf_a), 4095));
        return handle_amt_pc_req_at();
    }

    /* What the modem has been told, write by write. */
    texts_t modem_texts() const
    {
        texts_t text_list;
        char text_a[8192];
        for (ssize_t count = recv(m_modem_a[1], text_a, sizeof(text_a), MSG_DONTWAIT); count > 0;
             count = recv(m_modem_a[1], text_a, sizeof(text_a), MSG_DONTWAIT))
        {
            text_list.emplace_back(text_a, static_cast<size_t>(count));
        }
        return text_list;
    }

    const modem_line_c m_line;
    int m_modem_a[2];
};

TEST_F(at_command, empty_request_is_refused)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(serve(""), PUB_ERR_PARAM);
    EXPECT_EQ(without_line_numbers(capture),
              texts_t{error_line("amt/amt-handle", "handle_amt_pc_req_at", -101)});
    EXPECT_EQ(modem_texts(), texts_t{});
}

TEST_F(at_command, own_command_is_answered)
{
    EXPECT_EQ(serve("AT^DBTADDR=?\r"), PUB_ERR_NONE);
    EXPECT_EQ(serve("AT^DWIFIADDR=?\r"), PUB_ERR_NONE);
    EXPECT_EQ(m_line.pc_frames(), (texts_t{OK, OK}));
    EXPECT_EQ(modem_texts(), texts_t{});
}

TEST_F(at_command, own_command_is_found_anywhere)
{
    const std::string padding(4095 - 13, 'p');
    for (const char *const text : {"xAT^DBTADDR=?\r", "\r\n\r\nAT^DBTADDR=?\r\n", "AT^X;AT^DBTADDR=?\rAT"}) {
        EXPECT_EQ(serve(text), PUB_ERR_NONE);
    }
    EXPECT_EQ(serve(padding + "AT^DBTADDR=?\r"), PUB_ERR_NONE);
    EXPECT_EQ(serve(std::string("\0AT^DBTADDR=?\r", 14)), PUB_ERR_NONE);
    EXPECT_EQ(m_line.pc_frames(), (texts_t{OK, OK, OK, OK, OK}));
    EXPECT_EQ(modem_texts(), texts_t{});
}

TEST_F(at_command, anything_else_is_the_modems)
{
    const texts_t texts = {"x",
                           "ATI\r",
                           "at^dbtaddr=?\r",
                           "AT^DBTADDR=?",
                           "AT^DBTADDR=?\n",
                           "AT^DBTADDR\r",
                           "AT^DWLTS=0\r",
                           std::string(4095, 'm'),
                           std::string(4095 - 12, 'p') + "AT^DBTADDR=?"};
    for (const std::string &text : texts) {
        EXPECT_EQ(serve(text), PUB_ERR_NONE);
    }
    EXPECT_EQ(modem_texts(), texts);
    EXPECT_EQ(m_line.pc_frames(), texts_t{});
}

TEST_F(at_command, commands_are_tried_in_their_order)
{
    /* Each of a pair answers differently; the one looked for first is meant, wherever it stands. */
    EXPECT_EQ(serve("AT^DAMT1=9\rAT^DWIFIADDR=?\r"), PUB_ERR_NONE);
    EXPECT_EQ(serve("AT^DPCBACTRL=9\rAT^DBTADDR=?\r"), PUB_ERR_NONE);
    EXPECT_EQ(serve("AT^DAMT1=9\rAT^DDEVCONNCHK=9\r"), PUB_ERR_NONE);
    EXPECT_EQ(serve("AT^DAMT1=\rAT^DPCBACTRL=9\r"), PUB_ERR_NONE);
    EXPECT_EQ(m_line.pc_frames(), (texts_t{OK, OK, ERROR, ERROR}));
    EXPECT_EQ(modem_texts(), texts_t{});
}

TEST_F(at_command, missing_operands_are_refused_without_a_reply)
{
    for (const char *const command :
         {"AT^DGPSCTRL=\r", "AT^DWLTSD=\r", "AT^DWLTRD=\r", "AT^DPCBACTRL=\r", "AT^DPCBACTRL=2\r",
          "AT^DPCBACTRL=2,\r", "AT^DAMT1=\r", "AT^DBTADDR=\"\"\r", "AT^DBTADDR=\"", "AT^DAMT1=,"})
    {
        EXPECT_EQ(serve(command), PUB_ERR_PARAM) << command;
    }
    EXPECT_EQ(m_line.pc_frames(), texts_t{});
    EXPECT_EQ(modem_texts(), texts_t{});
}

TEST_F(at_command, unknown_operands_are_answered_with_an_error)
{
    const texts_t command_list = {"AT^DDEVCONNCHK=2\r", "AT^DDEVCONNCHK=\r", "AT^DBTCTRL=2\r",
                                  "AT^DBTCTRL=\r",      "AT^DGPSCTRL=1\r",   "AT^DWLTSD=2\r",
                                  "AT^DWLTRD=-1\r",     "AT^DPCBACTRL=3\r",  "AT^DAMT1=3\r"};
    for (const std::string &command : command_list) {
        EXPECT_EQ(serve(command), PUB_ERR_NONE) << command;
    }
    EXPECT_EQ(m_line.pc_frames(), texts_t(command_list.size(), ERROR));
}

TEST_F(at_command, unsent_reply_is_the_result)
{
    g_handle_context.m_fd_pc = -1;
    EXPECT_EQ(serve("AT^DBTADDR=?\r"), PUB_ERR_FAIL);
    EXPECT_EQ(modem_texts(), texts_t{});
}

} // namespace
