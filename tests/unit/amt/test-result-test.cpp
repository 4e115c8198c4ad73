#include "amt/amt-handle/request/test-result.h"

#include <unistd.h>

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

/*
 * Station numbers from 20 and item numbers from 36 on are refused by the files before anything is touched;
 * the smaller ones are tested on the running daemon.
 */
namespace {

const std::string OK = "\r\nOK\r\n";

std::string verdict_request(uint8_t id, int32_t station, int32_t verdict)
{
    return wire_packet(id, int_atom(39, station) + int_atom(36, verdict));
}

std::string read_reply(int32_t station, int32_t verdict, const std::string &description)
{
    return wire_packet(90, int_atom(39, station) + int_atom(36, verdict) + text_atom(37, description) +
                               int_atom(1, 0));
}

TEST(write_test_result, leaves_an_empty_description_out)
{
    const modem_line_c line;
    for (const std::string &description : {std::string(), text_atom(37, "")}) {
        line.answer(OK);
        EXPECT_EQ(line.handle(amt_modem_write_test_result,
                              wire_packet(91, int_atom(39, 20) + int_atom(36, 1) + description)),
                  PUB_ERR_NONE);
        EXPECT_EQ(line.commands(), std::vector<std::string>{"AT^DATOMW=20,1\r"});
    }
}

TEST(write_test_result, takes_126_characters_of_a_description)
{
    for (const size_t size : {1U, 125U, 126U, 127U, 128U, 300U}) {
        const modem_line_c line;
        line.answer(OK);
        const std::string atoms = int_atom(39, 20) + int_atom(36, 1) + text_atom(37, std::string(size, 'd'));
        EXPECT_EQ(line.handle(amt_modem_write_test_result, wire_packet(91, atoms)), PUB_ERR_NONE);
        const std::string expected = "AT^DATOMW=20,1," + std::string(size < 126 ? size : 126, 'd') + "\r";
        EXPECT_EQ(line.commands(), std::vector<std::string>{expected});
    }
}

TEST(write_test_result, looks_for_the_ok_before_an_error)
{
    const modem_line_c line;
    line.answer("\r\nERROR\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_write_test_result, verdict_request(91, 20, 1)), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{wire_packet(92, int_atom(1, 0))});
}

TEST(write_test_result, goes_to_the_modem_when_the_mirror_fails)
{
    const modem_line_c line;
    line.answer(OK);
    const log_capture_c capture;
    EXPECT_EQ(line.handle(amt_modem_write_test_result, verdict_request(91, 2147483647, -5)), PUB_ERR_NONE);
    EXPECT_EQ(line.commands(), std::vector<std::string>{"AT^DATOMW=2147483647,-5\r"});
    EXPECT_TRUE(capture.has("item index error: 2147483647\n"));
    EXPECT_EQ(capture.count_containing("] write fail amt station_num: 2147483647, station_result: -5\n"), 1);
    EXPECT_TRUE(capture.has("amt_modem_write_test_result m_buf_a[AT^DATOMW=2147483647,-5\r] m_buf_len[24]"));
    EXPECT_TRUE(capture.has("amt_modem_write_test_result  ret_val[0] m_buf_a[\r\nOK\r\n]"));
    EXPECT_TRUE(capture.has("amt_modem_write_test_result\tret_val[0]"));
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{wire_packet(92, int_atom(1, 0))});
}

TEST(read_test_result, reports_what_the_modem_says)
{
    const modem_line_c line;
    const log_capture_c capture;
    line.answer("\r\n^DATOMR: 123,1,x\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_read_test_result, wire_packet(89, int_atom(39, 40))), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets().size(), 1U);
    line.answer("\r\n^DATOMR: 45,2," + std::string(200, 'd') + "\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_read_test_result, wire_packet(89, int_atom(39, 40))), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{read_reply(45, 2, std::string(127, 'd'))});
    EXPECT_TRUE(capture.has("amt_modem_read_test_result m_buf_a[AT^DATOMR=1,40\r] m_buf_len[15]"));
    EXPECT_TRUE(capture.has("amt_modem_read_test_result ret_val[0] station_num[45] station_result[2]"));
    EXPECT_EQ(capture.count_containing("] write fail amt station_num: 45, station_result: 2. rtn:-3.\n"), 1);
}

TEST(read_test_result, looks_for_an_error_before_the_answer)
{
    const modem_line_c line;
    line.answer("\r\n^DATOMR: 45,2,x\r\n\r\n+CME ERROR: 1\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_read_test_result, wire_packet(89, int_atom(39, 40))), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{failure_packet(90)});
}

TEST(read_test_result, needs_the_blank_behind_the_prefix)
{
    const modem_line_c line;
    line.answer("\r\n^DATOMR:45,2,x\r\n" + OK);
    EXPECT_EQ(line.handle(amt_modem_read_test_result, wire_packet(89, int_atom(39, 40))), PUB_ERR_NONE);
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{read_reply(40, 0, "")});
}

TEST(write_pc_test_result, always_hands_the_request_on)
{
    const modem_line_c line;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(amt_modem_write_pc_test_result, verdict_request(91, 20, 1), AMT_CHANNEL_PC),
              PUB_ERR_NOT_FOUND);
    EXPECT_TRUE(capture.has("amt_modem_write_pc_test_result station_num=20,station_result=1"));
    EXPECT_EQ(capture.count_containing("] write fail amt station_num: 20, station_result: 1\n"), 1);
    EXPECT_TRUE(line.pc_frames().empty());
    EXPECT_TRUE(line.commands().empty());
}

TEST(item_test_result, beyond_the_last_item_is_answered_with_a_failure)
{
    const modem_line_c line;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(amt_item_write_test_result, verdict_request(230, 37, 1)), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("amt_item_write_test_result station_num[37] station_result[1]"));
    EXPECT_TRUE(capture.has("item index error: 36\n"));
    EXPECT_TRUE(capture.has("amt_item_write_test_result write_item ret_val[-119]"));
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{failure_packet(231)});
    EXPECT_EQ(line.handle(amt_item_read_test_result, wire_packet(228, int_atom(39, 36))), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("amt_item_read_test_result station_num[36] station_result[-3]"));
    EXPECT_TRUE(capture.has("amt_item_read_test_result read_item ret_val[-104]"));
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{failure_packet(229)});
}

TEST(item_test_result, the_smallest_number_wraps_to_the_largest_index)
{
    const modem_line_c line;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(amt_item_write_test_result, verdict_request(230, INT32_MIN, 1)), PUB_ERR_NONE);
    EXPECT_TRUE(capture.has("item index error: 2147483647\n"));
    EXPECT_EQ(line.app_packets(), std::vector<std::string>{failure_packet(231)});
}

TEST(item_test_result, checks_its_arguments)
{
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    for (const amt_handle_func handler : {amt_item_write_test_result, amt_item_read_test_result}) {
        EXPECT_EQ(handler(AMT_CHANNEL_APP, &req, &rsp), PUB_ERR_PARAM);
        EXPECT_EQ(handler(AMT_CHANNEL_APP, nullptr, &rsp), PUB_ERR_PARAM);
    }
}

} // namespace
