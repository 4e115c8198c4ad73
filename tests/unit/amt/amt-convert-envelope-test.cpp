#include <algorithm>
#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <random>
#include <string.h>
#include <string>
#include <vector>

#include "amt/amt-byte-order.h"
#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/unit/support/guarded-area.h"
#include "tests/unit/support/log-lines.h"

namespace {

using ::testing::ElementsAre;

const std::string STRIP = "amt_convert_pc_2_app";
const std::string WRAP = "amt_convert_app_2_pc";

const std::vector<uint8_t> EMPTY_PACKET_FRAME = {0xAA, 0xBB, 0xCC, 0xDD, 0x0E, 0x00, 0x00, 0x00,
                                                 0x02, 0x00, 0x00, 0x00, 0x06, 0x00, 0xBB, 0x0A,
                                                 0x00, 0x00, 0xF9, 0xA4, 0xAB, 0x02};

class amt_convert_envelope : public ::testing::Test {
protected:
    amt_convert_envelope()
        : m_area(sizeof(amt_buf_st)),
          m_buf_ptr(reinterpret_cast<amt_buf_st *>(static_cast<void *>(m_area.data())))
    {
        errno = 0;
    }

    void hold(const std::vector<uint8_t> &data, uint32_t length)
    {
        memset(m_area.data(), 0, m_area.size());
        std::copy(data.begin(), data.end(), m_buf_ptr->m_buf_a);
        m_buf_ptr->m_buf_len = length;
    }

    void hold(const std::vector<uint8_t> &data)
    {
        hold(data, static_cast<uint32_t>(data.size()));
    }

    std::vector<uint8_t> held() const
    {
        return std::vector<uint8_t>(m_buf_ptr->m_buf_a, m_buf_ptr->m_buf_a + m_buf_ptr->m_buf_len);
    }

    log_capture_c m_log;
    guarded_area_c m_area;
    amt_buf_st *m_buf_ptr;
};

TEST_F(amt_convert_envelope, empty_packet_is_wrapped_byte_for_byte)
{
    amt_packet_init(m_buf_ptr->m_buf_a, 0x0A);
    m_buf_ptr->m_buf_len = 0;
    EXPECT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_NONE);
    EXPECT_EQ(m_buf_ptr->m_buf_len, 22U);
    EXPECT_EQ(held(), EMPTY_PACKET_FRAME);
    EXPECT_THAT(m_log.texts(), ElementsAre(WRAP + "()"));
}

TEST_F(amt_convert_envelope, length_of_the_buffer_counts_when_there_is_one)
{
    hold({0x06, 0x00, 0xBB, 0x0A, 0x00, 0x00, 0x99}, 7);
    EXPECT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_NONE);
    EXPECT_EQ(m_buf_ptr->m_buf_len, 23U);
    EXPECT_EQ(m_buf_ptr->m_buf_a[4], 15);
    EXPECT_EQ(m_buf_ptr->m_buf_a[18], 0x99);
    EXPECT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a + 19), amt_checksum(m_buf_ptr->m_buf_a, 19));
}

TEST_F(amt_convert_envelope, envelope_is_stripped)
{
    hold(EMPTY_PACKET_FRAME);
    EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_NONE);
    EXPECT_THAT(held(), ElementsAre(0x06, 0x00, 0xBB, 0x0A, 0x00, 0x00));
    EXPECT_THAT(m_log.texts(), ElementsAre(STRIP + "()"));
}

TEST_F(amt_convert_envelope, only_the_magic_of_an_envelope_is_looked_at)
{
    std::vector<uint8_t> frame = EMPTY_PACKET_FRAME;
    for (const size_t i : std::initializer_list<size_t>{4, 5, 8, 9, 10, 18, 21}) {
        frame[i] = 0x77;
    }
    hold(frame);
    EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_NONE);
    EXPECT_THAT(held(), ElementsAre(0x06, 0x00, 0xBB, 0x0A, 0x00, 0x00));

    for (size_t i = 0; i < 4; i++) {
        frame = EMPTY_PACKET_FRAME;
        frame[i] ^= 0x01;
        hold(frame);
        EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_FAIL);
        EXPECT_EQ(held(), frame);
    }
}

TEST_F(amt_convert_envelope, shorter_than_17_bytes_is_no_envelope_and_no_message)
{
    for (uint32_t length = 1; length <= 20; length++) {
        std::vector<uint8_t> frame = EMPTY_PACKET_FRAME;
        frame.resize(length);
        hold(frame);
        EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), length < 17 ? PUB_ERR_FAIL : PUB_ERR_NONE) << length;
        EXPECT_EQ(m_buf_ptr->m_buf_len, length < 17 ? length : length - 16) << length;
    }
    EXPECT_EQ(m_log.texts(), std::vector<std::string>(20, STRIP + "()"));
}

TEST_F(amt_convert_envelope, longest_envelope_fills_the_buffer)
{
    std::vector<uint8_t> packet(4080);
    for (size_t i = 0; i < packet.size(); i++) {
        packet[i] = static_cast<uint8_t>(i * 7);
    }
    hold(packet);
    EXPECT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_NONE);
    EXPECT_EQ(m_buf_ptr->m_buf_len, 4096U);
    EXPECT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a + 4), 4088U);
    EXPECT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a + 4092), amt_checksum(m_buf_ptr->m_buf_a, 4092));
    EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_NONE);
    EXPECT_EQ(held(), packet);
}

TEST_F(amt_convert_envelope, packet_without_room_for_the_envelope_is_refused_untouched)
{
    for (const uint32_t length : {4081U, 4096U, 4097U, 65535U, 0x80000000U, 0xFFFFFFFFU}) {
        hold({0x06, 0x00, 0xBB, 0x0A, 0x00, 0x00}, length);
        const std::vector<uint8_t> before = m_area.content();
        EXPECT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_PARAM) << length;
        EXPECT_EQ(m_area.content(), before) << length;
    }
    for (const uint16_t claimed : std::initializer_list<uint16_t>{4081, 4096, 65535}) {
        hold({0x00, 0x00, 0xBB, 0x0A, 0x00, 0x00}, 0);
        amt_put_u16_le(m_buf_ptr->m_buf_a, claimed);
        const std::vector<uint8_t> before = m_area.content();
        EXPECT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_PARAM) << claimed;
        EXPECT_EQ(m_area.content(), before) << claimed;
    }
}

TEST_F(amt_convert_envelope, buffer_that_claims_more_than_it_holds_is_no_envelope)
{
    for (const uint32_t length : {4097U, 5000U, 0xFFFFFFFFU}) {
        hold(EMPTY_PACKET_FRAME, length);
        const std::vector<uint8_t> before = m_area.content();
        EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_FAIL) << length;
        EXPECT_EQ(m_area.content(), before) << length;
    }
}

TEST_F(amt_convert_envelope, absent_or_empty_buffers_are_refused)
{
    hold({}, 0);
    EXPECT_EQ(amt_convert_pc_2_app(nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_app_2_pc(nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_PARAM);

    const std::string strip_error = error_line("amt/amt-convert", STRIP, -101);
    const std::string wrap_error = error_line("amt/amt-convert", WRAP, -101);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(STRIP + "()", strip_error, "1, 0", STRIP + "()", strip_error, "0, 1", WRAP + "()",
                            wrap_error, "1", WRAP + "()", wrap_error, "1"));
}

TEST_F(amt_convert_envelope, random_packets_come_back_from_their_envelope)
{
    std::mt19937 random(6);
    for (int round = 0; round < 500; round++) {
        amt_packet_init(m_buf_ptr->m_buf_a, static_cast<uint8_t>(random()));
        while (random() % 8 != 0 && amt_packet_has_room(m_buf_ptr->m_buf_a, 600)) {
            const std::vector<uint8_t> data(1 + random() % 500, static_cast<uint8_t>(random()));
            amt_packet_add_bytes(m_buf_ptr->m_buf_a, static_cast<uint8_t>(random()), data.data(),
                                 static_cast<uint16_t>(data.size()));
        }
        const uint16_t length = amt_packet_get_length(m_buf_ptr->m_buf_a);
        const std::vector<uint8_t> packet(m_buf_ptr->m_buf_a, m_buf_ptr->m_buf_a + length);
        m_buf_ptr->m_buf_len = random() % 2 == 0 ? 0 : length;

        ASSERT_EQ(amt_convert_app_2_pc(m_buf_ptr), PUB_ERR_NONE);
        ASSERT_EQ(m_buf_ptr->m_buf_len, length + 16U);
        ASSERT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a), 0xDDCCBBAAU);
        ASSERT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a + 4), length + 8U);
        ASSERT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a + 8), 2U);
        ASSERT_EQ(amt_get_u32_le(m_buf_ptr->m_buf_a + 12 + length),
                  amt_checksum(m_buf_ptr->m_buf_a, 12U + length));
        ASSERT_EQ(amt_convert_pc_2_app(m_buf_ptr), PUB_ERR_NONE);
        ASSERT_EQ(held(), packet);
    }
}

} // namespace
