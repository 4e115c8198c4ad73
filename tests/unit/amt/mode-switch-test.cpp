#include "amt/amt-handle/request/mode-switch.h"

#include <poll.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace {

const std::string OK = "\r\nOK\r\n";
const std::string DONE = wire_packet(196, int_atom(1, 0));

volatile sig_atomic_t g_end_count = 0;

void note_end(int)
{
    g_end_count = g_end_count + 1;
}

/* SIGTERM is noted instead of ending the test; properties and the calls that set them are files. */
class normal_to_amt : public testing::Test {
protected:
    void SetUp() override
    {
        setenv("VX_HOST_PROPERTIES", m_properties.path("").c_str(), 1);
        setenv("VX_HOST_CALLS", m_calls.c_str(), 1);
        g_end_count = 0;
        struct sigaction action = {};
        action.sa_handler = note_end;
        ASSERT_EQ(sigaction(SIGTERM, &action, &m_old_action), 0);
    }

    void TearDown() override
    {
        sigaction(SIGTERM, &m_old_action, nullptr);
        unsetenv("VX_HOST_PROPERTIES");
        unsetenv("VX_HOST_CALLS");
    }

    int handle(int32_t mode) const
    {
        return m_line.handle(amt_handle_normal_to_amt, wire_packet(195, int_atom(201, mode)));
    }

    temp_folder_c m_properties;
    temp_folder_c m_folder;
    const std::string m_calls = m_folder.path("calls.txt");
    modem_line_c m_line;

private:
    struct sigaction m_old_action = {};
};

TEST_F(normal_to_amt, switches_the_modem_then_the_platform_then_ends)
{
    m_line.answer(OK);
    m_line.answer(OK);
    const log_capture_c capture;
    EXPECT_EQ(handle(2), PUB_ERR_NONE);
    const std::vector<std::string> commands = {"AT^DMPCHN=0\r", "AT^DSWAMT=2\r"};
    EXPECT_EQ(m_line.commands(), commands);
    EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{DONE});
    EXPECT_EQ(g_end_count, 1);
    EXPECT_EQ(read_whole_file(m_calls), "property_set(amt.normal.amt.switch_status, 1) = 0\n"
                                        "property_set(sys.usb.config, serial,adb) = 0\n"
                                        "property_set(ctl.stop, vx-kel-mla0) = 0\n");
    for (const char *const text :
         {"amt_handle_normal_to_amt amt_mode:2", "amt_change_band()", "amt_change_band band:0",
          "amt_change_band :\r\nOK\r\n", "amt_handle_normal_to_amt :\r\nOK\r\n",
          "set property(amt.normal.amt.switch_status) to 1.",
          "property-sys.usb.config value: @#no_set_config#@",
          "will set property(sys.usb.config) to serial,adb.", "will exit program.",
          "stop vx-kel-mla return: 0"})
    {
        EXPECT_TRUE(capture.has(text)) << text;
    }
}

TEST_F(normal_to_amt, looks_for_the_ok_before_an_error)
{
    m_line.answer("\r\nERROR\r\n" + OK);
    m_line.answer("\r\n+CMS ERROR: 1\r\n" + OK);
    EXPECT_EQ(handle(2), PUB_ERR_NONE);
    EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{DONE});
    EXPECT_EQ(g_end_count, 1);
}

TEST_F(normal_to_amt, leaves_a_serial_configuration_alone)
{
    for (const char *const config : {"serial", "mtp,serial,adb"}) {
        write_whole_file(m_properties.path("sys.usb.config"), config);
        m_line.answer(OK);
        m_line.answer(OK);
        const log_capture_c capture;
        EXPECT_EQ(handle(-3), PUB_ERR_NONE);
        EXPECT_EQ(m_line.commands().back(), "AT^DSWAMT=-3\r");
        EXPECT_EQ(read_whole_file(m_properties.path("sys.usb.config")), config);
        EXPECT_TRUE(capture.has("already activate serial, do not reset. "));
    }
    EXPECT_EQ(g_end_count, 2);
}

TEST_F(normal_to_amt, replaces_any_other_configuration)
{
    write_whole_file(m_properties.path("sys.usb.config"), "mtp,adb");
    m_line.answer(OK);
    m_line.answer(OK);
    EXPECT_EQ(handle(0), PUB_ERR_NONE);
    EXPECT_EQ(read_whole_file(m_properties.path("sys.usb.config")), "serial,adb");
}

TEST_F(normal_to_amt, changes_nothing_when_the_modem_refuses_either_command)
{
    m_line.answer("\r\nERROR\r\n");
    EXPECT_EQ(handle(2), PUB_ERR_NONE);
    EXPECT_EQ(m_line.commands(), std::vector<std::string>{"AT^DMPCHN=0\r"});
    EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{failure_packet(196)});
    m_line.answer(OK);
    m_line.answer("\r\n+CMS ERROR: 1\r\n");
    EXPECT_EQ(handle(2), PUB_ERR_NONE);
    EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{failure_packet(196)});
    EXPECT_EQ(read_whole_file(m_calls), "(missing)");
    EXPECT_EQ(g_end_count, 0);
}

TEST_F(normal_to_amt, takes_its_answers_split_anywhere)
{
    for (size_t i = 1; i < OK.size(); i++) {
        m_line.answer("\r\n+CREG: 1\r\n" + OK.substr(0, i));
        m_line.answer(OK.substr(i));
        EXPECT_EQ(amt_change_band(0), PUB_ERR_NONE);
        EXPECT_EQ(m_line.commands(), std::vector<std::string>{"AT^DMPCHN=0\r"});
    }
}

TEST_F(normal_to_amt, is_refused_without_a_modem_or_a_request)
{
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    EXPECT_EQ(amt_handle_normal_to_amt(AMT_CHANNEL_APP, &req, &rsp), PUB_ERR_PARAM);
    g_handle_state.m_is_no_modem = 1;
    EXPECT_EQ(handle(2), PUB_ERR_NO_MODEM);
    EXPECT_TRUE(m_line.app_packets().empty());
    EXPECT_EQ(g_end_count, 0);
}

int g_watched_fd = -1;
volatile sig_atomic_t g_was_answered = 0;

void note_answer(int)
{
    pollfd watch = {g_watched_fd, POLLIN, 0};
    g_was_answered = poll(&watch, 1, 0) == 1;
}

TEST_F(normal_to_amt, answers_before_it_ends)
{
    int line_a[2];
    ASSERT_EQ(pipe(line_a), 0);
    g_watched_fd = line_a[0];
    g_handle_context.m_pty.m_ptm_fd = line_a[1];
    signal(SIGTERM, note_answer);
    m_line.answer(OK);
    m_line.answer(OK);
    EXPECT_EQ(handle(2), PUB_ERR_NONE);
    EXPECT_EQ(g_was_answered, 1);
    close(line_a[0]);
    close(line_a[1]);
}

TEST_F(normal_to_amt, ends_with_the_status_of_its_answer)
{
    g_handle_context.m_pty.m_ptm_fd = 0;
    m_line.answer(OK);
    m_line.answer(OK);
    EXPECT_EQ(handle(2), PUB_ERR_FAIL);
    EXPECT_EQ(g_end_count, 1);
}

/* The permission file has an absolute path; what needs it is tested on the running daemon. */
class handshake_permission : public testing::Test {
protected:
    void SetUp() override
    {
        if (access("/amt", F_OK) == 0) {
            GTEST_SKIP() << "/amt exists";
        }
    }

    modem_line_c m_line;
};

TEST_F(handshake_permission, reads_as_granted_without_a_file)
{
    const log_capture_c capture;
    EXPECT_EQ(m_line.handle(amt_handle_damt1_cmd, wire_packet(219, int_atom(192, 2))), PUB_ERR_NONE);
    EXPECT_EQ(m_line.app_packets(),
              std::vector<std::string>{wire_packet(220, int_atom(192, 1) + int_atom(1, 0))});
    EXPECT_TRUE(capture.has("amt_handle_damt1_cmd op_type:2"));
    EXPECT_TRUE(capture.has("amt_handle_damt1_cmd op_type:2; flag:1; ret_val:0."));
}

TEST_F(handshake_permission, an_unknown_operation_is_answered_with_a_failure)
{
    for (const int32_t operation : {3, -1}) {
        EXPECT_EQ(m_line.handle(amt_handle_damt1_cmd, wire_packet(219, int_atom(192, operation))),
                  PUB_ERR_NONE);
        EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{failure_packet(220)});
    }
}

TEST_F(handshake_permission, that_cannot_be_written_is_answered_to_the_app_only)
{
    EXPECT_EQ(m_line.handle(amt_handle_damt1_cmd, wire_packet(219, int_atom(192, 1))), PUB_ERR_NONE);
    EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{failure_packet(220)});
    EXPECT_EQ(m_line.handle(amt_handle_not_permit_handshake, wire_packet(219, ""), AMT_CHANNEL_PC),
              PUB_ERR_FAIL);
    EXPECT_TRUE(m_line.pc_frames().empty());
}

TEST_F(handshake_permission, the_app_must_send_a_request_and_have_a_modem)
{
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    EXPECT_EQ(amt_handle_damt1_cmd(AMT_CHANNEL_APP, &req, &rsp), PUB_ERR_PARAM);
    /* The PC's empty request gets as far as the file. */
    EXPECT_EQ(amt_handle_not_permit_handshake(AMT_CHANNEL_PC, &req, &rsp), PUB_ERR_FAIL);
    g_handle_state.m_is_no_modem = 1;
    EXPECT_EQ(m_line.handle(amt_handle_damt1_cmd, wire_packet(219, int_atom(192, 2))), PUB_ERR_NO_MODEM);
}

TEST(not_permit_handshake, checks_the_presence_of_its_arguments)
{
    amt_buf_st buf = {};
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_not_permit_handshake(AMT_CHANNEL_NONE, &buf, &buf), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "1, 0, 0");
    EXPECT_EQ(amt_handle_not_permit_handshake(AMT_CHANNEL_PC, nullptr, &buf), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, 1, 0");
    EXPECT_EQ(amt_handle_not_permit_handshake(AMT_CHANNEL_PC, &buf, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, 0, 1");
}

} // namespace
