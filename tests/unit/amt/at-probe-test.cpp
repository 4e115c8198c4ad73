#include "amt/amt-handle/at/at-command.h"

#include <string>

#include <gtest/gtest.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/context.h"
#include "tests/unit/support/log-capture.h"

namespace {

const std::string REWRITTEN = "AT;^DLKS=1\r";

class at_probe : public testing::Test {
protected:
    void SetUp() override
    {
        g_handle_state.m_amt_mode =
            amt_mode_en::PC_TEXT; /* no need to enter it, which would ask the charger */
        g_amt_cfg = {};
    }
    void TearDown() override
    {
        amt_handle_clear_buf(&g_handle_context.m_req);
        g_handle_state.m_amt_mode = amt_mode_en{};
        g_amt_cfg = {};
    }

    /* What becomes of a held request. */
    static std::string rewrite(const std::string &text)
    {
        amt_buf_st &req = g_handle_context.m_req;
        amt_handle_clear_buf(&req);
        req.m_buf_len = static_cast<uint32_t>(text.copy(reinterpret_cast<char *>(req.m_buf_a), 4095));
        amt_at_probe_rewrite();
        for (uint32_t i = req.m_buf_len; i < sizeof(req.m_buf_a); i++) {
            EXPECT_EQ(req.m_buf_a[i], 0);
        }
        return {reinterpret_cast<const char *>(req.m_buf_a), req.m_buf_len};
    }
};

TEST_F(at_probe, short_probe_is_rewritten)
{
    for (const char *const text : {"AT\r", "at\r", "aT\r\n", "At\rxy", "AT\r\r\r", "AT\rAT"}) {
        EXPECT_EQ(rewrite(text), REWRITTEN) << text;
    }
    EXPECT_EQ(rewrite(std::string("AT\r\0\0", 5)), REWRITTEN);
}

TEST_F(at_probe, repeated_probe_is_rewritten)
{
    for (const std::string &text : {std::string("AT\rAT\r"), std::string("AT\r\nAT\r\n"),
                                    std::string("at\raT\rrest"), "AT\rAT\r" + std::string(4089, 'x')})
    {
        EXPECT_EQ(rewrite(text), REWRITTEN);
    }
}

TEST_F(at_probe, other_text_is_left_alone)
{
    for (const std::string &text :
         {std::string("A"), std::string("AT"), std::string("AT\n"), std::string("ATI\r"),
          std::string(" AT\r"), std::string("AT\rxyz"), std::string("AT\rxyAT\r"), std::string("AT\rAT\n"),
          std::string("AT\r\nATx"), std::string(4095, 'A'), "AT\r" + std::string(4092, 'A')})
    {
        EXPECT_EQ(rewrite(text), text);
    }
}

TEST_F(at_probe, sets_the_speed_of_a_serial_port_when_short)
{
    const std::string prefix = "convert speed 230400";
    g_amt_cfg.m_modem_uart_at_baudrate = 230400;
    g_handle_context.m_fd_modem = 1 << 20; /* nothing is open there: the attempt shows in the log */
    for (const char *const path : {"/dev/ttyS1", "/dev/ttyS", "/dev/ttyUSB0", "/dev/tty", ""}) {
        std::string(path).copy(g_amt_cfg.m_tty_modem_a, sizeof(g_amt_cfg.m_tty_modem_a) - 1);
        g_amt_cfg.m_tty_modem_a[std::string(path).size()] = '\0';
        const bool is_serial = std::string(path).rfind("/dev/ttyS", 0) == 0;
        const log_capture_c capture;
        rewrite("AT\r");
        EXPECT_EQ(capture.count_containing(prefix), is_serial ? 1 : 0) << path;
        rewrite("AT\rAT\r");
        rewrite("ATI\r");
        EXPECT_EQ(capture.count_containing(prefix), is_serial ? 1 : 0) << path;
    }
    g_handle_context.m_fd_modem = 0;
}

TEST_F(at_probe, enters_mode_4)
{
    for (const amt_mode_en mode : {amt_mode_en::PC_PACKETS, amt_mode_en::APP}) {
        g_handle_state.m_amt_mode = mode;
        const log_capture_c capture;
        rewrite("AT\r");
        EXPECT_EQ(g_handle_state.m_amt_mode, amt_mode_en::PC_TEXT);
        EXPECT_EQ(capture.count_containing("mark to enter amt4"), 1);
        EXPECT_EQ(capture.count_containing("call amt_usb_charge_ctrl for amt4. return:"), 1);
        rewrite("AT\r");
        EXPECT_EQ(capture.count_containing("mark to enter amt4"), 1);
    }
    g_handle_state.m_amt_mode = amt_mode_en::PC_PACKETS;
    rewrite("ATI\r");
    EXPECT_EQ(g_handle_state.m_amt_mode, amt_mode_en::PC_PACKETS);
}

} // namespace
