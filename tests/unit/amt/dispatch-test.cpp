#include "amt/amt-handle/reader/dispatch.h"

#include <errno.h>
#include <string.h>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/reader/registry.h"
#include "amt/amt-handle/request/version.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

constexpr char APP_FUNC[] = "handle_amt_app_req";
const std::string ACK("\xAA\xBB\xCC\xDD\x08\0\0\0\x02\x02\0\0\x76\x4A\xEE\x1D", 16);

/* What the handler under these tests was called with, and what it is to return. */
struct call_st
{
    int m_count;
    int m_status;
    uint32_t m_channel;
    amt_buf_st *m_req_ptr;
    amt_buf_st *m_rsp_ptr;
    bool m_is_rsp_clear;
    std::string m_request;
};
call_st g_call;

int serve(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    g_call.m_count++;
    g_call.m_channel = channel;
    g_call.m_req_ptr = req_ptr;
    g_call.m_rsp_ptr = rsp_ptr;
    static const amt_buf_st clear = {};
    g_call.m_is_rsp_clear = memcmp(rsp_ptr, &clear, sizeof(clear)) == 0;
    g_call.m_request.assign(reinterpret_cast<const char *>(req_ptr->m_buf_a), req_ptr->m_buf_len);
    return g_call.m_status;
}

int serve_and_hang_up(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    g_handle_context.m_pty.m_ptm_fd = -1;
    return serve(channel, req_ptr, rsp_ptr);
}

void hold(const std::string &text)
{
    amt_handle_clear_buf(&g_handle_context.m_req);
    g_handle_context.m_req.m_buf_len =
        static_cast<uint32_t>(text.copy(reinterpret_cast<char *>(g_handle_context.m_req.m_buf_a), 4095));
}

std::string held()
{
    return {reinterpret_cast<const char *>(g_handle_context.m_req.m_buf_a), g_handle_context.m_req.m_buf_len};
}

std::string envelope(const std::string &packet)
{
    amt_buf_st buf = {};
    buf.m_buf_len = static_cast<uint32_t>(packet.copy(reinterpret_cast<char *>(buf.m_buf_a), 4096));
    EXPECT_EQ(amt_convert_app_2_pc(&buf), PUB_ERR_NONE);
    return {reinterpret_cast<const char *>(buf.m_buf_a), buf.m_buf_len};
}

class dispatch : public testing::Test {
protected:
    void SetUp() override
    {
        amt_handle_clear_context();
        g_call = {};
        g_handle_state.m_amt_mode = amt_mode_en::PC_PACKETS;
    }
    void TearDown() override
    {
        amt_handle_clear_context();
    }
};

// the app

TEST_F(dispatch, app_request_goes_to_its_handler)
{
    const modem_line_c line;
    const std::string packet = wire_packet(9, int_atom(5, 1));
    amt_handle_reg_handle_func(AMT_TABLE_APP, 9, serve);
    hold(packet);
    g_handle_state.m_amt_mode = amt_mode_en::APP;
    const log_capture_c capture;
    handle_amt_app_req();
    EXPECT_EQ(g_call.m_count, 1);
    EXPECT_EQ(g_call.m_channel, AMT_CHANNEL_APP);
    EXPECT_EQ(g_call.m_req_ptr, &g_handle_context.m_req);
    EXPECT_EQ(g_call.m_rsp_ptr, &g_handle_context.m_rsp_app);
    EXPECT_EQ(g_call.m_request, packet);
    EXPECT_EQ(held(), "");
    EXPECT_EQ(line.app_packets(), texts_t{});
    EXPECT_EQ(g_handle_state.m_amt_mode, amt_mode_en::APP);
    EXPECT_EQ(capture.texts(),
              (texts_t{"handle_amt_app_req()", "receive command id: 9(0x09) - AMT_READ_BATTERY_CMD"}));
}

TEST_F(dispatch, app_request_that_fails_is_refused_and_forgotten)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_APP, 254, serve);
    for (const int status : {-1, -100, -104, 1}) {
        g_call.m_status = status;
        hold(wire_packet(254, ""));
        handle_amt_app_req();
        EXPECT_EQ(line.app_packets(), texts_t{wire_packet(255, int_atom(1, 1))});
        EXPECT_EQ(held(), "");
    }
}

TEST_F(dispatch, app_request_of_nobody_is_refused_and_forgotten)
{
    const modem_line_c line;
    for (const int number : {0, 9, 254, 255}) {
        const auto id = static_cast<uint8_t>(number);
        hold(wire_packet(id, int_atom(5, 1)));
        const log_capture_c capture;
        errno = 0;
        handle_amt_app_req();
        EXPECT_EQ(line.app_packets(), texts_t{wire_packet(static_cast<uint8_t>(number + 1), int_atom(1, 1))});
        EXPECT_EQ(held(), "");
        const texts_t text_list = without_line_numbers(capture);
        ASSERT_EQ(text_list.size(), 5U);
        EXPECT_EQ(text_list[2].substr(0, text_list[2].rfind(',')),
                  error_line("amt/amt-handle", APP_FUNC, -100)
                      .substr(0, error_line("amt/amt-handle", APP_FUNC, -100).rfind(',')));
        EXPECT_EQ(text_list[3], (number == 255 ? "unknown" : "unregistered") +
                                    std::string(" AMT request id: ") + std::to_string(number));
    }
}

TEST_F(dispatch, app_request_whose_refusal_cannot_be_sent_is_held)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_APP, 9, serve_and_hang_up);
    g_call.m_status = -100;
    const std::string packet = wire_packet(9, "");
    hold(packet);
    handle_amt_app_req();
    EXPECT_EQ(held(), packet);
    /* A request that is served is forgotten, whether its answer could be sent or not. */
    g_call.m_status = 0;
    handle_amt_app_req();
    EXPECT_EQ(held(), "");
}

TEST_F(dispatch, app_request_without_content_is_an_error)
{
    const modem_line_c line;
    hold("");
    g_handle_context.m_req.m_buf_a[0] = 7;
    const log_capture_c capture;
    errno = 0;
    handle_amt_app_req();
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"handle_amt_app_req()", error_line("amt/amt-handle", APP_FUNC, -101), "0, 0, 1, 0"}));
    EXPECT_EQ(g_handle_context.m_req.m_buf_a[0], 7);
    EXPECT_EQ(line.app_packets(), texts_t{});
}

TEST_F(dispatch, app_handler_finds_a_clear_response)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_APP, 9, serve);
    memset(&g_handle_context.m_rsp_app, 0x5A, sizeof(g_handle_context.m_rsp_app));
    hold(wire_packet(9, ""));
    handle_amt_app_req();
    EXPECT_TRUE(g_call.m_is_rsp_clear);
}

// the PC

TEST_F(dispatch, pc_handler_finds_a_clear_response_though_the_acknowledgement_is_stuck)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 193, serve);
    g_handle_context.m_fd_pc = 0;
    hold(envelope(wire_packet(193, "")));
    uint32_t id = 0;
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NONE);
    EXPECT_EQ(g_call.m_count, 1);
    EXPECT_TRUE(g_call.m_is_rsp_clear);
}

TEST_F(dispatch, pc_request_is_acknowledged_by_whom_its_row_names)
{
    const modem_line_c line;
    hold(envelope(wire_packet(170, "")));
    uint32_t id = 0;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve, amt_ack_en::HANDLER);
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NONE);
    EXPECT_EQ(line.pc_frames(), texts_t{});
    /* The app's row of the same id changes nothing for the PC. */
    amt_handle_reg_handle_func(AMT_TABLE_APP, 170, serve, amt_ack_en::DISPATCHER);
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NONE);
    EXPECT_EQ(line.pc_frames(), texts_t{});
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve);
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NONE);
    EXPECT_EQ(line.pc_frames(), texts_t{ACK});
}

TEST_F(dispatch, pc_request_is_acknowledged_and_goes_to_its_handler)
{
    const modem_line_c line;
    const std::string packet = wire_packet(170, int_atom(5, 1));
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve);
    for (const int status : {0, -1, -104, 7}) {
        g_call = {};
        g_call.m_status = status;
        hold(envelope(packet));
        uint32_t id = 0;
        EXPECT_EQ(handle_amt_pc_req(&id), status);
        EXPECT_EQ(id, 170U);
        EXPECT_EQ(g_call.m_count, 1);
        EXPECT_EQ(g_call.m_channel, AMT_CHANNEL_PC);
        EXPECT_EQ(g_call.m_req_ptr, &g_handle_context.m_pc);
        EXPECT_EQ(g_call.m_rsp_ptr, &g_handle_context.m_rsp_pc);
        EXPECT_EQ(g_call.m_request, packet);
        EXPECT_EQ(line.pc_frames(), texts_t{ACK});
        EXPECT_EQ(held(), envelope(packet)) << "the caller decides on it";
    }
}

TEST_F(dispatch, pc_requests_lead_to_mode_1)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve);
    for (const amt_mode_en mode : {amt_mode_en::PC_PACKETS, amt_mode_en::APP, amt_mode_en::PC_TEXT}) {
        for (const uint8_t id : {uint8_t{170}, uint8_t{9}}) {
            g_handle_state.m_amt_mode = mode;
            hold(envelope(wire_packet(id, "")));
            const log_capture_c capture;
            uint32_t ignored = 0;
            handle_amt_pc_req(&ignored);
            EXPECT_EQ(g_handle_state.m_amt_mode, amt_mode_en::PC_PACKETS);
            EXPECT_EQ(capture.count_containing("mark to enter amt1"),
                      mode == amt_mode_en::PC_PACKETS ? 0 : 1);
        }
    }
    /* Text does not. */
    g_handle_state.m_amt_mode = amt_mode_en::PC_TEXT;
    hold("AT^DSVER\r");
    uint32_t id = 0;
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NOT_FOUND);
    EXPECT_EQ(g_handle_state.m_amt_mode, amt_mode_en::PC_TEXT);
}

TEST_F(dispatch, version_request_is_acknowledged_by_its_handler)
{
    /* Under whatever id: it asks for no module that there is, which the handler finds out first. */
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 200, handle_amt_pc_req_version, amt_ack_en::HANDLER);
    hold(envelope(wire_packet(200, "")));
    uint32_t id = 0;
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_FAIL);
    EXPECT_EQ(id, 200U);
    EXPECT_EQ(line.pc_frames(), texts_t{});
}

TEST_F(dispatch, pc_request_of_nobody_is_handed_on)
{
    const modem_line_c line;
    for (const int number : {0, 9, 254, 255}) {
        const std::string frame = envelope(wire_packet(static_cast<uint8_t>(number), int_atom(5, 1)));
        hold(frame);
        const log_capture_c capture;
        uint32_t id = 0;
        EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NOT_FOUND);
        EXPECT_EQ(id, static_cast<uint32_t>(number));
        EXPECT_TRUE(
            capture.has("handle_context_st.m_handle_pc_func_a[" + std::to_string(number) + "] =(nil)"));
        EXPECT_EQ(held(), frame);
    }
    EXPECT_EQ(line.pc_frames(), texts_t{});
}

TEST_F(dispatch, text_of_the_pc_is_no_packet)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve);
    const std::string frame = envelope(wire_packet(170, ""));
    for (const std::string &text :
         {std::string("x"), std::string("AT^DBTADDR=?\r"), frame.substr(1), frame.substr(0, 16),
          wire_packet(170, std::string(30, 'x')), "x" + frame, std::string(4095, 'y')})
    {
        hold(text);
        uint32_t id = 0;
        const log_capture_c capture;
        EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NOT_FOUND);
        EXPECT_EQ(id, AMT_ID_NO_PACKET);
        EXPECT_EQ(capture.count_containing("receive command id"), 0);
        EXPECT_EQ(held(), text);
    }
    EXPECT_EQ(g_call.m_count, 0);
    EXPECT_EQ(line.pc_frames(), texts_t{});
}

TEST_F(dispatch, seventeen_bytes_are_enough_for_a_packet)
{
    /* Nothing but the magic is looked at; the id is whatever stands at its place. */
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve);
    hold(std::string("\xAA\xBB\xCC\xDD", 4) + std::string(11, '\xFF') + "\xAA\xFF");
    uint32_t id = 0;
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NONE);
    EXPECT_EQ(id, 170U);
    EXPECT_EQ(g_call.m_request, "\xFF");
}

TEST_F(dispatch, largest_request_of_the_pc_fits)
{
    const modem_line_c line;
    amt_handle_reg_handle_func(AMT_TABLE_PC, 170, serve);
    const std::string packet = wire_packet(170, bytes_atom(4, std::string(4068, 'z')));
    const std::string frame = envelope(packet);
    ASSERT_EQ(frame.size(), 4095U);
    hold(frame);
    uint32_t id = 0;
    EXPECT_EQ(handle_amt_pc_req(&id), PUB_ERR_NONE);
    EXPECT_EQ(g_call.m_request, packet);
}

} // namespace
