#include "amt/amt-handle/request/identity-request.h"

#include <string.h>

#include <gtest/gtest.h>

#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/unit/support/log-capture.h"

/* What needs no factory file; the rest is tested on the running daemon. */
namespace {

constexpr uint8_t PCBA_ID = 193;
constexpr uint8_t ADB_ID = 191;

struct exchange_st
{
    amt_buf_st m_req = {};
    amt_buf_st m_rsp = {};

    explicit exchange_st(uint8_t id)
    {
        amt_packet_init(m_req.m_buf_a, id);
        m_req.m_buf_len = amt_packet_get_length(m_req.m_buf_a);
    }
};

class identity_request_check : public testing::TestWithParam<amt_handle_func> {};

TEST_P(identity_request_check, refuses_no_channel_no_request_and_no_response)
{
    exchange_st exchange(PCBA_ID);
    amt_buf_st empty = {};
    EXPECT_EQ(GetParam()(AMT_CHANNEL_NONE, &exchange.m_req, &exchange.m_rsp), PUB_ERR_PARAM);
    EXPECT_EQ(GetParam()(AMT_CHANNEL_PC, nullptr, &exchange.m_rsp), PUB_ERR_PARAM);
    EXPECT_EQ(GetParam()(AMT_CHANNEL_PC, &empty, &exchange.m_rsp), PUB_ERR_PARAM);
    const log_capture_c capture;
    EXPECT_EQ(GetParam()(AMT_CHANNEL_PC, &exchange.m_req, nullptr), PUB_ERR_PARAM);
    EXPECT_TRUE(capture.has("0, 0, 0, 1"));
}

INSTANTIATE_TEST_SUITE_P(handlers, identity_request_check,
                         testing::Values(&amt_handle_board_pcba_ctrl, &amt_handle_adb_serial_no));

/* The acknowledgement that went before may still be there, if it could not be sent. */
TEST_P(identity_request_check, starts_its_response_afresh)
{
    exchange_st exchange(PCBA_ID);
    memset(&exchange.m_rsp, 0xA5, sizeof(exchange.m_rsp));
    EXPECT_NE(GetParam()(AMT_CHANNEL_PC, &exchange.m_req, &exchange.m_rsp), PUB_ERR_NONE);
    EXPECT_EQ(exchange.m_rsp.m_buf_len, 0U);
    EXPECT_EQ(amt_packet_get_length(exchange.m_rsp.m_buf_a), AMT_PACKET_HEADER_SIZE);
}

/* The operation is the first byte of the atom, whatever its type. */
void expect_unknown_pcba_operation(exchange_st *exchange_ptr, const std::string &operation)
{
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_board_pcba_ctrl(AMT_CHANNEL_PC, &exchange_ptr->m_req, &exchange_ptr->m_rsp),
              PUB_ERR_PARAM);
    EXPECT_TRUE(capture.has("amt_handle_board_pcba_ctrl()"));
    EXPECT_TRUE(capture.has("pcba op-type: " + operation + "."));
    EXPECT_EQ(capture.count_containing("FUNC-amt_handle_board_pcba_ctrl(), error_code=-101"), 1);
    EXPECT_EQ(capture.texts().back(), "unknown operation type: " + operation);
}

TEST(board_pcba_ctrl, an_absent_or_empty_operation_is_0)
{
    exchange_st absent(PCBA_ID);
    expect_unknown_pcba_operation(&absent, "0");
    exchange_st empty(PCBA_ID);
    amt_packet_add_string(empty.m_req.m_buf_a, 190, "");
    expect_unknown_pcba_operation(&empty, "0");
}

TEST(board_pcba_ctrl, takes_the_first_byte_of_any_type)
{
    exchange_st number(PCBA_ID);
    amt_packet_add_int(number.m_req.m_buf_a, 190, 0x01020304);
    expect_unknown_pcba_operation(&number, "4");
    exchange_st text(PCBA_ID);
    amt_packet_add_string(text.m_req.m_buf_a, 190, "12");
    expect_unknown_pcba_operation(&text, "49");
    exchange_st single(PCBA_ID);
    amt_packet_add_bool(single.m_req.m_buf_a, 190, 255);
    expect_unknown_pcba_operation(&single, "255");
}

TEST(board_pcba_ctrl, an_empty_number_is_not_written)
{
    exchange_st exchange(PCBA_ID);
    amt_packet_add_bool(exchange.m_req.m_buf_a, 190, 2);
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_board_pcba_ctrl(AMT_CHANNEL_PC, &exchange.m_req, &exchange.m_rsp), PUB_ERR_FAIL);
    EXPECT_TRUE(capture.has("getted pcba-sn: ."));
    EXPECT_EQ(capture.count_containing("FUNC-amt_handle_board_pcba_ctrl(), error_code=-100"), 1);
    EXPECT_EQ(capture.texts().back(), "write error.");
}

class adb_operation : public testing::TestWithParam<int32_t> {};

TEST_P(adb_operation, is_unknown)
{
    exchange_st exchange(ADB_ID);
    amt_packet_add_int(exchange.m_req.m_buf_a, 160, GetParam());
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_adb_serial_no(AMT_CHANNEL_PC, &exchange.m_req, &exchange.m_rsp), PUB_ERR_PARAM);
    EXPECT_EQ(capture.count_containing("FUNC-amt_handle_adb_serial_no(), error_code=-101"), 1);
    EXPECT_EQ(capture.texts().back(), "unknown operation: " + std::to_string(GetParam()));
}

INSTANTIATE_TEST_SUITE_P(values, adb_operation, testing::Values(2, 3, -1, INT32_MAX, INT32_MIN));

class adb_length : public testing::TestWithParam<int32_t> {};

TEST_P(adb_length, is_invalid)
{
    exchange_st exchange(ADB_ID);
    amt_packet_add_int(exchange.m_req.m_buf_a, 160, 1);
    amt_packet_add_int(exchange.m_req.m_buf_a, 162, GetParam());
    amt_packet_add_string(exchange.m_req.m_buf_a, 161, "0123");
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_adb_serial_no(AMT_CHANNEL_PC, &exchange.m_req, &exchange.m_rsp), PUB_ERR_FAIL);
    EXPECT_EQ(capture.count_containing("FUNC-amt_handle_adb_serial_no(), error_code=-100"), 1);
    EXPECT_EQ(capture.texts().back(), "Invalid adb serial number length!");
}

INSTANTIATE_TEST_SUITE_P(values, adb_length, testing::Values(0, 100, -1, INT32_MAX, INT32_MIN));

} // namespace
