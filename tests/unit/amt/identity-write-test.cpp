#include "amt/amt-handle/reader/identity-write.h"

#include <algorithm>
#include <dlfcn.h>
#include <functional>
#include <stdio.h>
#include <string.h>
#include <string>
#include <thread>
#include <unistd.h>
#include <utility>

#include <gtest/gtest.h>

#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

namespace {

using texts_t = std::vector<std::string>;

constexpr char ACCEPTED[] = "\r\nOK\r\n";

/* What is pending, and what the log calls it. */
struct kind_st
{
    int m_number;
    const char *m_name_ptr;
    const char *m_path_ptr;
    const char *m_second_path_ptr;
};
constexpr kind_st IMEI = {1, "imei", "/amt/imei.txt", "/amt/imei-2.txt"};
constexpr kind_st SN = {2, "sn", "/amt/sn.txt", "/amt/sn-2.txt"};

void put(amt_buf_st *buf_ptr, const std::string &content)
{
    amt_handle_clear_buf(buf_ptr);
    buf_ptr->m_buf_len =
        static_cast<uint32_t>(content.copy(reinterpret_cast<char *>(buf_ptr->m_buf_a), 4095));
}

amt_buf_st make_buf(const std::string &content)
{
    amt_buf_st buf;
    put(&buf, content);
    return buf;
}

std::string to_pc(const std::string &packet)
{
    amt_buf_st buf = make_buf(packet);
    EXPECT_EQ(amt_convert_app_2_pc(&buf), PUB_ERR_NONE);
    return {reinterpret_cast<const char *>(buf.m_buf_a), buf.m_buf_len};
}

/* Run once, when an identity's file is opened. */
std::function<void()> g_in_open;

/* The handset's folder is not there, so each writing fails and says what it would have written where. */
class identity_write : public testing::Test {
protected:
    void SetUp() override
    {
        if (access("/amt", F_OK) == 0) {
            GTEST_SKIP() << "this machine has a folder /amt, which the tests must not write to";
        }
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

    /* The modem's answer, looked at. Returns what was logged. */
    static texts_t complete(const std::string &answer)
    {
        const log_capture_c capture;
        const amt_buf_st buf = make_buf(answer);
        amt_identity_complete(&buf);
        return capture.texts();
    }

    static void expect_none_pending()
    {
        EXPECT_EQ(complete(ACCEPTED), texts_t{"g_cur_treat_cmd_type:0;"});
    }

    /* The modem accepts what is pending: this is what goes to the file, once. */
    static void expect_saved(const kind_st &kind, const std::string &text, int channel,
                             const std::string &answer = ACCEPTED)
    {
        const texts_t text_list = complete(answer);
        ASSERT_FALSE(text_list.empty());
        EXPECT_EQ(text_list[0], "g_cur_treat_cmd_type:" + std::to_string(kind.m_number) + ";");
        const std::string name = kind.m_name_ptr;
        const std::string path = channel == 1 ? kind.m_second_path_ptr : kind.m_path_ptr;
        const std::string entry = "handle_amt_imei_and_sn_save_file()";
        if (text.empty()) {
            EXPECT_EQ(text_list.back(), entry);
        } else {
            EXPECT_EQ(std::count(text_list.begin(), text_list.end(), entry), 1);
            EXPECT_EQ(std::count(text_list.begin(), text_list.end(),
                                 "save " + name + " to file. channel:" + std::to_string(channel) +
                                     "; content:" + text + ";"),
                      1);
            EXPECT_EQ(std::count(text_list.begin(), text_list.end(),
                                 "open(\"" + path + "\") fail: 2 - No such file or directory"),
                      1);
            EXPECT_EQ(text_list.back(), "write " + name + " error.");
        }
        expect_none_pending();
    }
};

TEST_F(identity_write, of_at_text)
{
    const log_capture_c capture;
    capture_text("AT^DCGSNW=3500\r");
    capture_text("AT^DMSN= KEL 1 \r\n");
    EXPECT_EQ(capture.texts(), (texts_t{"handle_amt_imei_and_sn--->req_id_en:255.",
                                        "received at command in amt4:AT^DCGSNW=3500\r",
                                        "getted parameter:3500. prefix:AT^DCGSNW=; rtn:0.",
                                        "handle_amt_imei_and_sn--->req_id_en:255.",
                                        "received at command in amt4:AT^DMSN= KEL 1 \r\n",
                                        "getted parameter:KEL 1 . prefix:AT^DMSN=; rtn:0."}));
    expect_saved(SN, "KEL 1 ", 0);
    capture_text("AT^DCGSNW=3500\r");
    expect_saved(IMEI, "3500", 0);
}

/* Text goes before what the packet around it is. */
TEST_F(identity_write, a_channel_in_a_packet_s_text_is_no_identity)
{
    put(&g_handle_context.m_pc, wire_packet(87, text_atom(38, "KEL-2")));
    capture_text("AT^DMPCHN=1\r", 87);
    expect_none_pending();
    capture_text("AT^DMSN=KEL-1\r");
    expect_saved(SN, "KEL-1", 1);
}

/* A write that comes while the one before it is being saved waits for its own answer. */
TEST_F(identity_write, of_the_same_kind_meanwhile_stays_pending)
{
    capture_text("AT^DCGSNW=3500\r");
    g_in_open = [] { capture_text("AT^DCGSNW=3600\r"); };
    EXPECT_EQ(complete(ACCEPTED).back(), "write imei error.");
    EXPECT_EQ(g_in_open, nullptr) << "the file was opened";
    expect_saved(IMEI, "3600", 0);
}

TEST_F(identity_write, of_at_text_behind_zero_bytes)
{
    capture_text(std::string("\0\0AT^DCGSNW=3500\r", 17));
    expect_saved(IMEI, "3500", 0);
    capture_text(std::string("AT^DMSN=12\0\00034\r", 15));
    expect_saved(SN, "12", 0);
}

TEST_F(identity_write, waits_for_its_acceptance)
{
    capture_text("AT^DCGSNW=3500\r");
    for (const char *const answer : {"", "OK", "\r\nERROR\r\n", "\r\nOK"}) {
        const texts_t text_list = complete(answer);
        EXPECT_EQ(text_list.front(), "g_cur_treat_cmd_type:1;");
        EXPECT_EQ(std::count(text_list.begin(), text_list.end(), "handle_amt_imei_and_sn_save_file()"), 0);
    }
    expect_saved(IMEI, "3500", 0, "noise\r\nOK\r\nmore");
}

TEST_F(identity_write, is_accepted_behind_zero_bytes)
{
    /* An answer behind an envelope that is full of them. */
    capture_text("AT^DCGSNW=3500\r");
    expect_saved(IMEI, "3500", 0, to_pc(wire_packet(90, int_atom(1, 0))) + "\r\nOK\r\n");
}

TEST_F(identity_write, is_accepted_by_a_packet_of_result_0)
{
    capture_packet(5, text_atom(21, "3500"));
    EXPECT_EQ(complete(to_pc(wire_packet(6, int_atom(1, 3)))),
              (texts_t{"g_cur_treat_cmd_type:1;", "amt_convert_pc_2_app()",
                       "getted error-code from modem: err-code:3;"}));
    EXPECT_EQ(complete(to_pc(wire_packet(90, int_atom(1, 0)))),
              (texts_t{"g_cur_treat_cmd_type:1;", "amt_convert_pc_2_app()"}));
    expect_saved(IMEI, "3500", 0, to_pc(wire_packet(6, int_atom(1, 0))));
    capture_packet(87, text_atom(38, "KEL1"));
    expect_saved(SN, "KEL1", 0, to_pc(wire_packet(88, int_atom(1, 0))));
}

TEST_F(identity_write, takes_20_characters)
{
    const std::string text = "123456789012345678901234567890";
    capture_text("AT^DCGSNW=" + text + "\r");
    expect_saved(IMEI, text.substr(0, 20), 0);
    capture_text("AT^DMSN=" + text);
    expect_saved(SN, text.substr(0, 20), 0);
}

TEST_F(identity_write, of_the_channel_is_a_number)
{
    for (const auto &[text, channel] : {std::pair<const char *, int>{"1", 1},
                                        {" 2\r", 2},
                                        {"x\r", 0},
                                        {"257\r", 1},
                                        {"-1\r", 255},
                                        {"", 0}})
    {
        capture_text("AT^DMPCHN=77\r");
        capture_text(std::string("AT^DMPCHN=") + text);
        expect_none_pending();
        capture_text("AT^DMSN=1\r");
        expect_saved(SN, "1", channel);
    }
}

TEST_F(identity_write, looks_for_one_text_at_a_time)
{
    capture_text("AT^DMPCHN=1;AT^DMSN=22;AT^DCGSNW=33\r");
    expect_saved(IMEI, "33", 0);
    capture_text("AT^DMPCHN=1;AT^DMSN=22\r");
    expect_saved(SN, "22", 0);
}

TEST_F(identity_write, without_a_parameter_empties_the_slot)
{
    capture_text("AT^DCGSNW=3500\r");
    capture_text("AT\rAT^DCGSNW=33\r"); /* the parameter ends at the first line end */
    expect_saved(IMEI, "", 0);
}

TEST_F(identity_write, of_packets)
{
    const log_capture_c capture;
    capture_packet(5, text_atom(21, "3500"));
    capture_packet(87, text_atom(38, "KEL1"));
    capture_packet(232, int_atom(159, 257));
    EXPECT_EQ(
        capture.texts(),
        (texts_t{"handle_amt_imei_and_sn--->req_id_en:5.", "getted write-imei command in amt1: imei:3500;",
                 "handle_amt_imei_and_sn--->req_id_en:87.", "getted write-board command in amt1: board:KEL1;",
                 "handle_amt_imei_and_sn--->req_id_en:232.",
                 "getted switch-channel command in amt1: channel:257;"}));
    expect_saved(SN, "KEL1", 1);
    capture_packet(5, text_atom(21, "3500"));
    expect_saved(IMEI, "3500", 1);
}

TEST_F(identity_write, of_packets_takes_20_characters)
{
    const std::string text = "123456789012345678901234567890";
    for (const size_t size : {19U, 20U, 21U, 22U, 30U}) {
        capture_packet(5, text_atom(21, text.substr(0, size)));
        expect_saved(IMEI, text.substr(0, size).substr(0, 20), 0);
        capture_packet(87, text_atom(38, text.substr(0, size)));
        expect_saved(SN, text.substr(0, size).substr(0, 20), 0);
    }
}

TEST_F(identity_write, of_packets_without_their_atom_empties_the_slot)
{
    capture_packet(5, text_atom(21, "3500"));
    capture_packet(232, int_atom(159, 1));
    capture_packet(5, int_atom(22, 1));
    expect_saved(IMEI, "", 1);
    capture_packet(232, "");
    capture_packet(5, text_atom(21, "3500"));
    expect_saved(IMEI, "3500", 0);
}

TEST_F(identity_write, looks_at_few_ids_only)
{
    put(&g_handle_context.m_pc, wire_packet(7, text_atom(21, "3500") + text_atom(38, "KEL1")));
    for (uint32_t id = 0; id <= 255; id++) {
        const bool is_looked_at = id == 0 || id == 5 || id == 87 || id == 232 || id == 255;
        amt_identity_reset();
        capture_text("AT^DMSN=1\r", id);
        if (is_looked_at) {
            expect_saved(SN, "1", 0);
        } else {
            expect_none_pending();
        }
    }
}

TEST_F(identity_write, text_in_a_packet_wins_over_its_atoms)
{
    put(&g_handle_context.m_pc, wire_packet(5, text_atom(21, "3500")));
    capture_text("AT^DMSN=1\r", 5);
    expect_saved(SN, "1", 0);
}

TEST_F(identity_write, that_is_reset_is_forgotten)
{
    capture_text("AT^DMPCHN=1\r");
    capture_text("AT^DMSN=12\r");
    amt_identity_reset();
    expect_none_pending();
    capture_text("AT^DMSN=12\r");
    expect_saved(SN, "12", 0);
}

/* The PC captures while the modem accepts: what is saved is one write or the other, never a mixture. */
TEST_F(identity_write, is_saved_as_it_was_captured)
{
    const log_capture_c capture;
    std::thread modem([] {
        const amt_buf_st buf = make_buf(ACCEPTED);
        for (int i = 0; i < 300; i++) {
            amt_identity_complete(&buf);
        }
    });
    for (int i = 0; i < 300; i++) {
        capture_text(i % 2 == 0 ? "AT^DCGSNW=AAAAAAAAAAAAAAAAAAAA\r" : "AT^DMSN=BBBBBBBBBBBBBBBBBBBB\r");
    }
    modem.join();
    const int saved = capture.count_containing("save ");
    EXPECT_EQ(capture.count_containing("save imei to file. channel:0; content:AAAAAAAAAAAAAAAAAAAA;") +
                  capture.count_containing("save sn to file. channel:0; content:BBBBBBBBBBBBBBBBBBBB;"),
              saved);
}

} // namespace

extern "C" FILE *fopen(const char *path, const char *mode)
{
    if (g_in_open != nullptr && strncmp(path, "/amt/", 5) == 0) {
        const std::function<void()> in_open = std::exchange(g_in_open, nullptr);
        in_open();
    }
    using fopen_func = FILE *(*)(const char *, const char *);
    static const fopen_func next = reinterpret_cast<fopen_func>(dlsym(RTLD_NEXT, "fopen"));
    return next(path, mode);
}
