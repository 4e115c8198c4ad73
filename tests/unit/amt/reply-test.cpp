#include "amt/amt-handle/channel/reply.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/amt/small-file.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;

constexpr char SOURCE[] = "amt/amt-handle";
constexpr uint32_t NO_CHANNEL_A[] = {0, 255, 256, 511, 0xFFFFFF00U};

const std::string ACK("\xAA\xBB\xCC\xDD\x08\0\0\0\x02\x02\0\0\x76\x4A\xEE\x1D", 16);

amt_buf_st make_rsp(const std::string &content, uint32_t length)
{
    amt_buf_st rsp = {};
    content.copy(reinterpret_cast<char *>(rsp.m_buf_a), sizeof(rsp.m_buf_a));
    rsp.m_buf_len = length;
    return rsp;
}

bool is_clear(const amt_buf_st &rsp)
{
    static const amt_buf_st zero = {};
    return memcmp(&rsp, &zero, sizeof(rsp)) == 0;
}

std::string to_pc(const std::string &packet)
{
    amt_buf_st buf = make_rsp(packet, static_cast<uint32_t>(packet.size()));
    EXPECT_EQ(amt_convert_app_2_pc(&buf), PUB_ERR_NONE);
    return {reinterpret_cast<const char *>(buf.m_buf_a), buf.m_buf_len};
}

TEST(response, goes_out_in_one_write_and_is_forgotten)
{
    const modem_line_c line;
    const log_capture_c capture;
    const std::string text = "\r\nOK\r\n";
    amt_buf_st rsp = make_rsp(text, 6);
    EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, &rsp), PUB_ERR_NONE);
    EXPECT_TRUE(is_clear(rsp));
    EXPECT_EQ(line.pc_frames(), texts_t{text});
    EXPECT_EQ(line.app_packets(), texts_t{});
    EXPECT_EQ(capture.texts(), texts_t{"send PC rsp data: : (data_len = 6) -- 0D0A4F4B0D0A"});
}

TEST(response, goes_to_the_app_on_every_other_channel)
{
    for (const uint32_t channel : {2U, 3U, 254U}) {
        const modem_line_c line;
        const log_capture_c capture;
        amt_buf_st rsp = make_rsp("abc", 3);
        EXPECT_EQ(amt_handle_send_rsp(channel, &rsp), PUB_ERR_NONE);
        EXPECT_EQ(line.app_packets(), texts_t{"abc"});
        EXPECT_EQ(capture.texts(), texts_t{"send APP rsp data: : (data_len = 3) -- 616263"});
    }
}

TEST(response, takes_its_length_from_the_packet)
{
    const modem_line_c line;
    const std::string packet = wire_packet(86, int_atom(1, 0));
    amt_buf_st rsp = make_rsp(packet + "left over", 0);
    EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_APP, &rsp), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), texts_t{packet});
    EXPECT_TRUE(is_clear(rsp));
}

TEST(response, fills_a_whole_buffer)
{
    const modem_line_c line;
    const std::string text(AMT_PACKET_SIZE, 'f');
    amt_buf_st rsp = make_rsp(text, AMT_PACKET_SIZE);
    EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, &rsp), PUB_ERR_NONE);
    EXPECT_EQ(line.pc_frames(), texts_t{text});
}

TEST(response, without_a_length_is_refused)
{
    const modem_line_c line;
    for (const uint32_t length : {0U, AMT_PACKET_SIZE + 1, 0xFFFFFFFFU}) {
        const log_capture_c capture;
        amt_buf_st rsp = make_rsp("", length);
        errno = 0;
        EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, &rsp), PUB_ERR_PARAM);
        EXPECT_EQ(without_line_numbers(capture), texts_t{error_line(SOURCE, "amt_handle_send_rsp", -101)});
    }
    EXPECT_EQ(line.pc_frames(), texts_t{});
}

TEST(response, on_a_closed_line_is_kept)
{
    const modem_line_c line;
    for (const int fd : {0, -1}) {
        g_handle_context.m_fd_pc = fd;
        const log_capture_c capture;
        amt_buf_st rsp = make_rsp("abc", 3);
        errno = 0;
        EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, &rsp), PUB_ERR_FAIL);
        EXPECT_EQ(without_line_numbers(capture),
                  (texts_t{error_line(SOURCE, "amt_handle_send_rsp", -100), "invalid fd"}));
        EXPECT_EQ(memcmp(rsp.m_buf_a, "abc", 4), 0);
        EXPECT_EQ(rsp.m_buf_len, 3U);
    }
}

TEST(response, that_cannot_be_written_is_kept)
{
    const modem_line_c line;
    const int fd = open("/dev/null", O_RDONLY | O_CLOEXEC);
    ASSERT_GT(fd, 0);
    g_handle_context.m_fd_pc = fd;
    const log_capture_c capture;
    amt_buf_st rsp = make_rsp("abc", 3);
    EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, &rsp), PUB_ERR_FILE);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"sys call: write() failed! errno = 9",
                       error_line(SOURCE, "amt_handle_send_rsp", -118, EBADF)}));
    EXPECT_EQ(memcmp(rsp.m_buf_a, "abc", 4), 0);
    close(fd);
}

TEST(response, written_in_part_is_kept)
{
    const modem_line_c line;
    const small_file_c file(5);
    g_handle_context.m_fd_pc = file.fd();
    amt_buf_st rsp = make_rsp("\r\nERROR\r\n", 9);
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, &rsp), PUB_ERR_INCOMPLETE);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{error_line(SOURCE, "amt_handle_send_rsp", -119), "WARNING !",
                       "write not completed: to write(9) != written(5)"}));
    EXPECT_EQ(memcmp(rsp.m_buf_a, "\r\nERROR\r\n", 10), 0);
    EXPECT_EQ(rsp.m_buf_len, 9U);
}

TEST(response, has_a_channel_and_a_buffer)
{
    const modem_line_c line;
    amt_buf_st rsp = make_rsp("abc", 3);
    for (const uint32_t channel : NO_CHANNEL_A) {
        const log_capture_c capture;
        errno = 0;
        EXPECT_EQ(amt_handle_send_rsp(channel, &rsp), PUB_ERR_PARAM);
        EXPECT_EQ(amt_handle_send_rsp_ok(channel, &rsp, 1), PUB_ERR_PARAM);
        EXPECT_EQ(amt_handle_send_rsp_err(channel, &rsp, 1, 1), PUB_ERR_PARAM);
        EXPECT_EQ(without_line_numbers(capture),
                  (texts_t{error_line(SOURCE, "amt_handle_send_rsp", -101), "1, 0",
                           error_line(SOURCE, "amt_handle_send_rsp_ok", -101), "1, 0",
                           error_line(SOURCE, "amt_handle_send_rsp_err", -101), "1, 0"}));
    }
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_send_rsp(AMT_CHANNEL_PC, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(amt_handle_send_rsp_ok(AMT_CHANNEL_APP, nullptr, 1), PUB_ERR_PARAM);
    EXPECT_EQ(amt_handle_send_rsp_err(0, nullptr, 1, 1), PUB_ERR_PARAM);
    EXPECT_EQ(capture.count_containing("0, 1"), 2);
    EXPECT_EQ(capture.count_containing("1, 1"), 1);
    EXPECT_EQ(line.pc_frames(), texts_t{});
    EXPECT_EQ(line.app_packets(), texts_t{});
}

TEST(response, of_a_result_is_a_packet_with_atom_1)
{
    const modem_line_c line;
    for (const int rsp_id : {0, 1, 175, 255}) {
        const auto id = static_cast<uint8_t>(rsp_id);
        amt_buf_st rsp = make_rsp(std::string(AMT_PACKET_SIZE, '\x5A'), 77);
        EXPECT_EQ(amt_handle_send_rsp_ok(AMT_CHANNEL_APP, &rsp, id), PUB_ERR_NONE);
        EXPECT_TRUE(is_clear(rsp));
        EXPECT_EQ(amt_handle_send_rsp_err(AMT_CHANNEL_APP, &rsp, id, -7), PUB_ERR_NONE);
        EXPECT_EQ(amt_handle_send_rsp_ok(AMT_CHANNEL_PC, &rsp, id), PUB_ERR_NONE);
        EXPECT_EQ(amt_handle_send_rsp_err(AMT_CHANNEL_PC, &rsp, id, 10), PUB_ERR_NONE);
        EXPECT_EQ(line.app_packets(),
                  (texts_t{wire_packet(id, int_atom(1, 0)), wire_packet(id, int_atom(1, -7))}));
        EXPECT_EQ(line.pc_frames(),
                  (texts_t{to_pc(wire_packet(id, int_atom(1, 0))), to_pc(wire_packet(id, int_atom(1, 10)))}));
    }
}

TEST(response, acknowledgement_is_fixed)
{
    const modem_line_c line;
    amt_buf_st rsp = make_rsp(std::string(AMT_PACKET_SIZE, '\x5A'), 77);
    EXPECT_EQ(amt_handle_send_pre_rsp_for_pc(AMT_CHANNEL_PC, &rsp), PUB_ERR_NONE);
    EXPECT_TRUE(is_clear(rsp));
    EXPECT_EQ(line.pc_frames(), texts_t{ACK});
}

TEST(response, acknowledgement_is_the_pcs_alone)
{
    const modem_line_c line;
    amt_buf_st rsp = make_rsp("abc", 3);
    const log_capture_c capture;
    errno = 0;
    for (const uint32_t channel : {0U, 2U, 255U, 257U}) {
        EXPECT_EQ(amt_handle_send_pre_rsp_for_pc(channel, &rsp), PUB_ERR_PARAM);
    }
    EXPECT_EQ(amt_handle_send_pre_rsp_for_pc(AMT_CHANNEL_PC, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.count_containing("1, 0"), 4);
    EXPECT_EQ(capture.count_containing("0, 1"), 1);
    EXPECT_EQ(rsp.m_buf_len, 3U);
    EXPECT_EQ(line.pc_frames(), texts_t{});
    EXPECT_EQ(line.app_packets(), texts_t{});
}

TEST(response, is_wrapped_for_the_pc_only)
{
    const modem_line_c line;
    const std::string packet = wire_packet(194, text_atom(191, "SN"));
    for (const uint32_t channel : {AMT_CHANNEL_PC, AMT_CHANNEL_APP}) {
        amt_buf_st rsp = make_rsp(packet, 0);
        EXPECT_EQ(amt_reply_finish(channel, &rsp), PUB_ERR_NONE);
        EXPECT_TRUE(is_clear(rsp));
    }
    EXPECT_EQ(line.pc_frames(), texts_t{to_pc(packet)});
    EXPECT_EQ(line.app_packets(), texts_t{packet});
}

TEST(response, that_does_not_fit_its_envelope_is_refused)
{
    const modem_line_c line;
    /* The largest packet that leaves room for 16 bytes, and one more byte. */
    for (const size_t size : {4080U, 4081U}) {
        const std::string packet = wire_packet(9, bytes_atom(4, std::string(size - 11, 'p')));
        amt_buf_st rsp = make_rsp(packet, 0);
        const int status = amt_reply_finish(AMT_CHANNEL_PC, &rsp);
        EXPECT_EQ(status, size == 4080 ? PUB_ERR_NONE : PUB_ERR_PARAM);
    }
    EXPECT_EQ(line.pc_frames().size(), 1U);
}

int enter(uint32_t channel, const amt_buf_st *req_ptr, const amt_buf_st *rsp_ptr)
{
    return amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr);
}

int enter_modem(uint32_t channel, const amt_buf_st *req_ptr, const amt_buf_st *rsp_ptr)
{
    return amt_reply_enter_modem(g_amt_gps_log, channel, req_ptr, rsp_ptr);
}

TEST(request, has_a_channel_content_and_room_for_a_response)
{
    const modem_line_c line;
    const amt_buf_st req = make_rsp("abc", 3);
    const amt_buf_st empty = {};
    for (const uint32_t channel : {0U, 1U, 2U, 254U, 256U}) {
        const log_capture_c capture;
        EXPECT_EQ(enter(channel, &req, &empty), PUB_ERR_NONE);
        EXPECT_EQ(enter_modem(channel, &req, &empty), PUB_ERR_NONE);
        EXPECT_EQ(capture.texts(), (texts_t{"enter()", "enter_modem()"}));
    }
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(enter(255, &req, &empty), PUB_ERR_PARAM);
    EXPECT_EQ(enter(1, nullptr, &empty), PUB_ERR_PARAM);
    EXPECT_EQ(enter(1, &empty, &empty), PUB_ERR_PARAM);
    EXPECT_EQ(enter_modem(1, &req, nullptr), PUB_ERR_PARAM);
    const std::string entry = "enter()";
    const std::string line_text = error_line("amt/amt-device", "enter", -101);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{entry, line_text, "1, 0, 0, 0", entry, line_text, "0, 1, 0, 0", entry, line_text,
                       "0, 0, 1, 0", "enter_modem()", error_line("amt/amt-gps", "enter_modem", -101),
                       "0, 0, 0, 1"}));
}

TEST(request, is_named_with_the_line_that_enters)
{
    const amt_buf_st req = make_rsp("abc", 3);
    const log_capture_c capture;
    const int line = __LINE__ + 1;
    EXPECT_EQ(amt_reply_enter(g_amt_handle_log, 1, &req, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.count_containing(", LINE-" + std::to_string(line) + ", FUNC-TestBody()"), 1);
}

TEST(request, needs_the_modem_after_its_arguments)
{
    const modem_line_c line;
    g_handle_state.m_is_no_modem = 1;
    const amt_buf_st req = make_rsp("abc", 3);
    const amt_buf_st empty = {};
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(enter(1, &req, &empty), PUB_ERR_NONE);
    EXPECT_EQ(enter_modem(1, &req, &empty), PUB_ERR_NO_MODEM);
    EXPECT_EQ(enter_modem(255, &req, &empty), PUB_ERR_PARAM);
    EXPECT_EQ(amt_reply_check_modem({g_amt_handle_log, "somebody", 12}), PUB_ERR_NO_MODEM);
    EXPECT_EQ(without_line_numbers(capture),
              (texts_t{"enter()", "enter_modem()", error_line("amt/amt-gps", "enter_modem", -111),
                       "WARNING !", "no CP.", "enter_modem()", error_line("amt/amt-gps", "enter_modem", -101),
                       "1, 0, 0, 0", error_line("amt/amt-handle", "somebody", -111), "WARNING !", "no CP."}));
}

TEST(reply, starts_in_a_clear_buffer)
{
    amt_buf_st rsp = make_rsp(std::string(AMT_PACKET_SIZE, '\x5A'), 16);
    amt_reply_start(&rsp, 192);
    EXPECT_EQ(rsp.m_buf_len, 0U);
    const std::string packet = wire_packet(192, "");
    const std::string whole = packet + std::string(AMT_PACKET_SIZE - packet.size(), '\0');
    EXPECT_EQ(std::string(reinterpret_cast<const char *>(rsp.m_buf_a), AMT_PACKET_SIZE), whole);
}

TEST(reply, ends_with_its_result)
{
    const modem_line_c line;
    const std::string packet = wire_packet(194, text_atom(191, "SN") + int_atom(1, 0));
    for (const uint32_t channel : {AMT_CHANNEL_PC, AMT_CHANNEL_APP}) {
        amt_buf_st rsp = make_rsp(std::string(AMT_PACKET_SIZE, '\x5A'), 16);
        amt_reply_start(&rsp, 194);
        amt_packet_add_string(rsp.m_buf_a, 191, "SN");
        EXPECT_EQ(amt_reply_finish_ok(channel, &rsp), PUB_ERR_NONE);
        EXPECT_TRUE(is_clear(rsp));
    }
    EXPECT_EQ(line.pc_frames(), texts_t{to_pc(packet)});
    EXPECT_EQ(line.app_packets(), texts_t{packet});
}

TEST(reply, of_a_failure_is_result_10)
{
    const modem_line_c line;
    for (const uint32_t channel : {AMT_CHANNEL_PC, AMT_CHANNEL_APP}) {
        amt_buf_st rsp = make_rsp(std::string(AMT_PACKET_SIZE, '\x5A'), 16);
        EXPECT_EQ(amt_reply_fail(channel, &rsp, 86), PUB_ERR_NONE);
    }
    EXPECT_EQ(line.pc_frames(), texts_t{to_pc(failure_packet(86))});
    EXPECT_EQ(line.app_packets(), texts_t{failure_packet(86)});
    g_handle_context.m_fd_pc = 0;
    amt_buf_st rsp = {};
    EXPECT_EQ(amt_reply_fail(AMT_CHANNEL_PC, &rsp, 86), PUB_ERR_FAIL);
}

} // namespace
