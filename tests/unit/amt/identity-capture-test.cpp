#include "amt/amt-handle/reader/identity-capture.h"

#include <string>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/identity-slots.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

namespace {

using texts_t = std::vector<std::string>;

std::string get_text(int kind)
{
    char text_a[AMT_IDENTITY_TEXT_SIZE];
    amt_identity_get_text(kind, text_a);
    return text_a;
}

void put(amt_buf_st *buf_ptr, const std::string &content)
{
    amt_handle_clear_buf(buf_ptr);
    buf_ptr->m_buf_len =
        static_cast<uint32_t>(content.copy(reinterpret_cast<char *>(buf_ptr->m_buf_a), 4095));
}

class identity_capture : public testing::Test {
protected:
    void SetUp() override
    {
        amt_identity_reset();
    }
    void TearDown() override
    {
        amt_identity_reset();
        amt_handle_clear_buf(&g_handle_context.m_req);
        amt_handle_clear_buf(&g_handle_context.m_pc);
    }

    /* A request that was no packet. */
    static void capture_text(const std::string &text, uint32_t id = AMT_ID_NO_PACKET)
    {
        put(&g_handle_context.m_req, text);
        amt_identity_capture(id);
    }

    /* A packet whose envelope has been taken off. */
    static void capture_packet(uint8_t id, const std::string &atoms)
    {
        put(&g_handle_context.m_req, std::string("\xAA\xBB\xCC\xDD\0", 5));
        put(&g_handle_context.m_pc, wire_packet(id, atoms));
        amt_identity_capture(id);
    }

    static void expect_captured(const std::string &imei, const std::string &sn, int channel, int pending)
    {
        EXPECT_EQ(get_text(AMT_IDENTITY_IMEI), imei);
        EXPECT_EQ(get_text(AMT_IDENTITY_SN), sn);
        EXPECT_EQ(amt_identity_get_channel(), channel);
        EXPECT_EQ(amt_identity_get_pending(), pending);
    }
};

TEST_F(identity_capture, of_at_text)
{
    const log_capture_c capture;
    capture_text("AT^DCGSNW=3500\r");
    expect_captured("3500", "", 0, AMT_IDENTITY_IMEI);
    capture_text("AT^DMSN= KEL 1 \r\n");
    expect_captured("3500", "KEL 1 ", 0, AMT_IDENTITY_SN);
    EXPECT_EQ(capture.texts(), (texts_t{"handle_amt_imei_and_sn--->req_id_en:255.",
                                        "received at command in amt4:AT^DCGSNW=3500\r",
                                        "getted parameter:3500. prefix:AT^DCGSNW=; rtn:0.",
                                        "handle_amt_imei_and_sn--->req_id_en:255.",
                                        "received at command in amt4:AT^DMSN= KEL 1 \r\n",
                                        "getted parameter:KEL 1 . prefix:AT^DMSN=; rtn:0."}));
}

TEST_F(identity_capture, takes_20_characters)
{
    const std::string text = "123456789012345678901234567890";
    capture_text("AT^DCGSNW=" + text + "\r");
    capture_text("AT^DMSN=" + text);
    expect_captured(text.substr(0, 20), text.substr(0, 20), 0, AMT_IDENTITY_SN);
}

TEST_F(identity_capture, of_the_channel_is_a_number)
{
    for (const auto &[text, channel] : {std::pair<const char *, int>{"1", 1},
                                        {" 2\r", 2},
                                        {"x\r", 0},
                                        {"257\r", 1},
                                        {"-1\r", 255},
                                        {"", 0}})
    {
        amt_identity_set_channel(77);
        capture_text(std::string("AT^DMPCHN=") + text);
        expect_captured("", "", channel, AMT_IDENTITY_NONE);
    }
}

TEST_F(identity_capture, looks_for_one_text_at_a_time)
{
    capture_text("AT^DMPCHN=1;AT^DMSN=22;AT^DCGSNW=33\r");
    expect_captured("33", "", 0, AMT_IDENTITY_IMEI);
    capture_text("AT^DMPCHN=1;AT^DMSN=22\r");
    expect_captured("33", "22", 0, AMT_IDENTITY_SN);
}

TEST_F(identity_capture, without_a_parameter_empties_the_slot)
{
    amt_identity_set_text(AMT_IDENTITY_IMEI, "3500", 4);
    capture_text("AT\rAT^DCGSNW=33\r"); /* the parameter ends at the first line end */
    expect_captured("", "", 0, AMT_IDENTITY_IMEI);
}

TEST_F(identity_capture, of_packets)
{
    const log_capture_c capture;
    capture_packet(5, text_atom(21, "3500"));
    expect_captured("3500", "", 0, AMT_IDENTITY_IMEI);
    capture_packet(87, text_atom(38, "KEL1"));
    expect_captured("3500", "KEL1", 0, AMT_IDENTITY_SN);
    capture_packet(232, int_atom(159, 257));
    expect_captured("3500", "KEL1", 1, AMT_IDENTITY_SN);
    EXPECT_EQ(
        capture.texts(),
        (texts_t{"handle_amt_imei_and_sn--->req_id_en:5.", "getted write-imei command in amt1: imei:3500;",
                 "handle_amt_imei_and_sn--->req_id_en:87.", "getted write-board command in amt1: board:KEL1;",
                 "handle_amt_imei_and_sn--->req_id_en:232.",
                 "getted switch-channel command in amt1: channel:257;"}));
}

TEST_F(identity_capture, of_packets_takes_20_characters)
{
    const std::string text = "123456789012345678901234567890";
    for (const size_t size : {19U, 20U, 21U, 22U, 30U}) {
        capture_packet(5, text_atom(21, text.substr(0, size)));
        capture_packet(87, text_atom(38, text.substr(0, size)));
        expect_captured(text.substr(0, size).substr(0, 20), text.substr(0, size).substr(0, 20), 0,
                        AMT_IDENTITY_SN);
    }
}

TEST_F(identity_capture, of_packets_without_their_atom_empties_the_slot)
{
    amt_identity_set_text(AMT_IDENTITY_IMEI, "3500", 4);
    amt_identity_set_channel(1);
    capture_packet(5, int_atom(22, 1));
    capture_packet(232, "");
    expect_captured("", "", 0, AMT_IDENTITY_IMEI);
}

TEST_F(identity_capture, looks_at_few_ids_only)
{
    put(&g_handle_context.m_pc, wire_packet(7, text_atom(21, "3500") + text_atom(38, "KEL1")));
    for (uint32_t id = 0; id <= 255; id++) {
        const bool is_looked_at = id == 0 || id == 5 || id == 87 || id == 232 || id == 255;
        amt_identity_reset();
        capture_text("AT^DMSN=1\r", id);
        expect_captured("", is_looked_at ? "1" : "", 0, is_looked_at ? AMT_IDENTITY_SN : AMT_IDENTITY_NONE);
    }
}

TEST_F(identity_capture, text_in_a_packet_wins_over_its_atoms)
{
    put(&g_handle_context.m_pc, wire_packet(5, text_atom(21, "3500")));
    capture_text("AT^DMSN=1\r", 5);
    expect_captured("", "1", 0, AMT_IDENTITY_SN);
}

} // namespace
