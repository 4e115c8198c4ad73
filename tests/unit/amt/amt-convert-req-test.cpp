#include "amt/amt-convert.h"

#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <random>
#include <string.h>
#include <string>
#include <vector>

#include "amt/amt-byte-order.h"
#include "amt/amt-command.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/unit/support/guarded-area.h"
#include "tests/unit/support/log-lines.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;

const std::string FUNC = "amt_convert_req_amt_data_2_at_data";
const std::string ENTRY = FUNC + "()";

std::string req_error(int code)
{
    return error_line("amt/amt-convert", FUNC, code);
}

class amt_convert_req : public ::testing::Test {
protected:
    amt_convert_req() : m_packet(AMT_PACKET_SIZE), m_out(AMT_PACKET_SIZE)
    {
        amt_packet_init(packet(), AMT_IQPOWER_RSPCMD);
        memset(m_out.data(), 0x5A, m_out.size());
        errno = 0;
    }

    uint8_t *packet() const
    {
        return m_packet.data();
    }

    int convert()
    {
        return amt_convert_req_amt_data_2_at_data(packet(), m_out.data(), m_out.size(), &m_out_len);
    }

    std::vector<uint8_t> block() const
    {
        return m_out.head(m_out_len);
    }

    void claim_atoms(uint16_t length)
    {
        amt_put_u16_le(packet() + 4, length);
    }

    log_capture_c m_log;
    guarded_area_c m_packet;
    guarded_area_c m_out;
    uint32_t m_out_len = 77;
};

TEST_F(amt_convert_req, values_stand_bare_behind_the_command)
{
    amt_packet_add_int(packet(), 9, 0x11223344);
    amt_packet_add_bool(packet(), 8, 1);

    EXPECT_EQ(convert(), PUB_ERR_NONE);

    EXPECT_THAT(block(), ElementsAre(0x1A, 0x44, 0x33, 0x22, 0x11, 0x01));
    EXPECT_EQ(m_out_len, 6U);
    const std::vector<uint8_t> all = m_out.content();
    EXPECT_THAT(std::vector<uint8_t>(all.begin() + 6, all.end()), Each(0));
    EXPECT_THAT(without_line_numbers(m_log), ElementsAre(ENTRY));
}

TEST_F(amt_convert_req, records_carry_tag_and_priority)
{
    convert();
    ASSERT_EQ(m_log.records().size(), 1U);
    EXPECT_EQ(m_log.records()[0].m_tag, "vx-kel-amt");
    EXPECT_EQ(m_log.records()[0].m_priority, 3);
}

TEST_F(amt_convert_req, packet_without_atoms_is_its_command_alone)
{
    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_THAT(block(), ElementsAre(0x1A));
}

TEST_F(amt_convert_req, texts_and_bytes_pass_unchanged)
{
    const uint8_t data_a[] = {0xEE, 0x00, 0xBB};
    amt_packet_add_string(packet(), 1, "ab");
    amt_packet_add_bytes(packet(), 2, data_a, 3);
    amt_packet_add_string(packet(), 3, "");

    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_THAT(block(), ElementsAre(0x1A, 'a', 'b', 0xEE, 0x00, 0xBB));
}

TEST_F(amt_convert_req, dsp_command_puts_the_length_before_each_value)
{
    const uint8_t data_a[] = {7, 8, 9};
    amt_packet_init(packet(), AMT_DSP_TRANSPARENT_CONTROL_CMD);
    amt_packet_add_bytes(packet(), 1, data_a, 3);
    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_THAT(block(), ElementsAre(0x97, 0x03, 0x00, 7, 8, 9));

    amt_packet_add_int(packet(), 2, 5);
    amt_packet_add_bool(packet(), 3, 6);
    amt_packet_add_string(packet(), 4, "");
    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_THAT(block(), ElementsAre(0x97, 3, 0, 7, 8, 9, 4, 0, 5, 0, 0, 0, 1, 0, 6, 0, 0));
}

TEST_F(amt_convert_req, only_the_dsp_command_has_lengths)
{
    for (int cmd = 0; cmd <= UINT8_MAX; cmd++) {
        amt_packet_init(packet(), static_cast<uint8_t>(cmd));
        amt_packet_add_bool(packet(), 1, 3);
        ASSERT_EQ(convert(), PUB_ERR_NONE);
        EXPECT_EQ(m_out_len, cmd == 0x97 ? 4U : 2U) << cmd;
        EXPECT_EQ(m_out.data()[0], cmd);
    }
}

TEST_F(amt_convert_req, absent_arguments_are_refused)
{
    uint8_t *out = m_out.data();
    EXPECT_EQ(amt_convert_req_amt_data_2_at_data(nullptr, out, 4096, &m_out_len), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_req_amt_data_2_at_data(packet(), nullptr, 4096, &m_out_len), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_req_amt_data_2_at_data(packet(), out, 0, &m_out_len), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_req_amt_data_2_at_data(packet(), out, 4096, nullptr), PUB_ERR_PARAM);

    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(ENTRY, req_error(-101), "1, 0, 0, 0", ENTRY, req_error(-101), "0, 1, 0, 0", ENTRY,
                            req_error(-101), "0, 0, 1, 0", ENTRY, req_error(-101), "0, 0, 0, 1"));
    EXPECT_THAT(m_out.content(), Each(0x5A));
    EXPECT_EQ(m_out_len, 77U);
}

TEST_F(amt_convert_req, foreign_packet_head_is_refused)
{
    packet()[2] = 0x0B;
    EXPECT_EQ(convert(), PUB_ERR_FAIL);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(ENTRY, req_error(-100), "command head mismatch: 0B != BB"));
    EXPECT_EQ(m_out_len, 0U);
    EXPECT_THAT(m_out.content(), Each(0));
}

TEST_F(amt_convert_req, foreign_atom_head_is_refused_and_what_was_converted_stays)
{
    amt_packet_add_bool(packet(), 1, 5);
    amt_packet_add_bool(packet(), 2, 6);
    packet()[12] = 0xED;
    EXPECT_EQ(convert(), PUB_ERR_FAIL);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(ENTRY, req_error(-100), "atom head mismatch: ED != EE"));
    EXPECT_THAT(block(), ElementsAre(0x1A, 5));
}

TEST_F(amt_convert_req, integer_of_another_length_is_refused)
{
    amt_packet_add_int(packet(), 1, 5);
    for (const int length : {0, 1, 2, 3, 5, 0x1234, 0xFFFF}) {
        amt_put_u16_le(packet() + 9, static_cast<uint16_t>(length));
        EXPECT_EQ(convert(), PUB_ERR_FAIL) << length;
        EXPECT_THAT(block(), ElementsAre(0x1A));
    }
    EXPECT_TRUE(m_log.has("atom length mismatch: 00 != 04"));
    EXPECT_TRUE(m_log.has("atom length mismatch: 02 != 04"));
    EXPECT_TRUE(m_log.has("atom length mismatch: 05 != 04"));
    EXPECT_TRUE(m_log.has("atom length mismatch: 1234 != 04"));
    EXPECT_TRUE(m_log.has("atom length mismatch: FFFF != 04"));
    EXPECT_EQ(without_line_numbers(m_log)[1], req_error(-100));
}

TEST_F(amt_convert_req, boolean_of_another_length_is_refused)
{
    amt_packet_add_bool(packet(), 1, 5);
    for (const int length : {0, 2, 4}) {
        amt_put_u16_le(packet() + 9, static_cast<uint16_t>(length));
        EXPECT_EQ(convert(), PUB_ERR_FAIL) << length;
    }
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(ENTRY, req_error(-100), "atom length mismatch: 00 != 01", ENTRY, req_error(-100),
                            "atom length mismatch: 02 != 01", ENTRY, req_error(-100),
                            "atom length mismatch: 04 != 01"));
}

TEST_F(amt_convert_req, unknown_types_are_refused)
{
    amt_packet_add_bool(packet(), 1, 5);
    for (int type = 0; type <= UINT8_MAX; type++) {
        packet()[8] = static_cast<uint8_t>(type);
        const bool is_known = type >= 2 && type <= 4;
        EXPECT_EQ(convert(), is_known ? PUB_ERR_NONE : PUB_ERR_FAIL) << type;
    }
    EXPECT_TRUE(m_log.has("unknown atom value type: 00"));
    EXPECT_TRUE(m_log.has("unknown atom value type: 05"));
    EXPECT_TRUE(m_log.has("unknown atom value type: FF"));
    EXPECT_EQ(m_log.count_containing("unknown atom value type: "), 252);
    EXPECT_TRUE(m_log.has("atom length mismatch: 01 != 04")); /* type 1 */
}

TEST_F(amt_convert_req, dsp_length_stays_in_the_block_when_the_value_is_refused)
{
    amt_packet_init(packet(), AMT_DSP_TRANSPARENT_CONTROL_CMD);
    amt_packet_add_int(packet(), 1, 5);
    amt_put_u16_le(packet() + 9, 2);
    EXPECT_EQ(convert(), PUB_ERR_FAIL);
    EXPECT_THAT(block(), ElementsAre(0x97, 0x02, 0x00));
}

TEST_F(amt_convert_req, atoms_are_read_while_any_of_the_atom_length_remains)
{
    amt_packet_add_bool(packet(), 1, 5);
    amt_packet_add_bool(packet(), 2, 6);
    claim_atoms(6);
    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_THAT(block(), ElementsAre(0x1A, 5));
    for (uint16_t claimed = 7; claimed <= 12; claimed++) {
        claim_atoms(claimed);
        EXPECT_EQ(convert(), PUB_ERR_NONE) << claimed;
        EXPECT_THAT(block(), ElementsAre(0x1A, 5, 6)) << claimed;
    }
    claim_atoms(13); /* what follows is zero bytes */
    EXPECT_EQ(convert(), PUB_ERR_FAIL);
    EXPECT_TRUE(m_log.has("atom head mismatch: 00 != EE"));
}

TEST_F(amt_convert_req, full_packet_converts_whole)
{
    const std::vector<uint8_t> data(4085, 0x42);
    amt_packet_add_bytes(packet(), 1, data.data(), 4085);
    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_EQ(m_out_len, 4086U);
    EXPECT_EQ(m_out.data()[4085], 0x42);
    EXPECT_EQ(m_out.data()[4086], 0);
}

TEST_F(amt_convert_req, empty_atom_at_the_very_end_of_the_packet_converts)
{
    const std::vector<uint8_t> data(4080, 0x42);
    amt_packet_add_bytes(packet(), 1, data.data(), 4080);
    amt_packet_add_string(packet(), 2, "");
    EXPECT_EQ(amt_packet_get_length(packet()), AMT_PACKET_SIZE);
    EXPECT_EQ(convert(), PUB_ERR_NONE);
    EXPECT_EQ(m_out_len, 4081U);
}

TEST_F(amt_convert_req, value_that_passes_the_packet_is_refused)
{
    const std::vector<uint8_t> data(4085, 0x42);
    amt_packet_add_bytes(packet(), 1, data.data(), 4085);
    for (const uint16_t length : std::initializer_list<uint16_t>{4086, 4087, 32768, 65531, 65535}) {
        amt_put_u16_le(packet() + 9, length);
        for (const uint16_t claimed : std::initializer_list<uint16_t>{1, 4090, 65535}) {
            claim_atoms(claimed);
            EXPECT_EQ(convert(), PUB_ERR_FAIL);
            EXPECT_THAT(block(), ElementsAre(0x1A));
        }
    }
    EXPECT_EQ(without_line_numbers(m_log)[1], req_error(-100));
    EXPECT_EQ(m_log.texts()[2], "atom at 6 leads outside the packet");
}

TEST_F(amt_convert_req, atom_head_that_passes_the_packet_is_refused)
{
    for (uint16_t fill = 4075; fill <= 4085; fill++) {
        const std::vector<uint8_t> data(fill, 0x42);
        amt_packet_init(packet(), 1);
        amt_packet_add_bytes(packet(), 1, data.data(), fill);
        for (uint32_t i = 6U + 5U + fill; i < AMT_PACKET_SIZE; i++) {
            packet()[i] = 0xEE;
        }
        claim_atoms(65535);
        EXPECT_EQ(convert(), PUB_ERR_FAIL) << fill;
        EXPECT_EQ(m_out_len, fill + 1U);
    }
    EXPECT_EQ(m_log.texts().back(), "atom at 4096 leads outside the packet");
}

TEST_F(amt_convert_req, block_that_is_too_small_is_refused)
{
    const uint8_t data_a[] = {7, 8, 9};
    for (const uint8_t cmd : {AMT_IQPOWER_CMD, AMT_DSP_TRANSPARENT_CONTROL_CMD}) {
        const uint32_t needed = cmd == AMT_DSP_TRANSPARENT_CONTROL_CMD ? 11 : 7;
        amt_packet_init(packet(), cmd);
        amt_packet_add_bytes(packet(), 1, data_a, 3);
        amt_packet_add_bytes(packet(), 2, data_a, 3);
        for (uint32_t capacity = 1; capacity <= 12; capacity++) {
            const guarded_area_c out(capacity);
            uint32_t length = 0;
            const int result = amt_convert_req_amt_data_2_at_data(packet(), out.data(), capacity, &length);
            EXPECT_EQ(result, capacity < needed ? PUB_ERR_FAIL : PUB_ERR_NONE) << capacity;
            EXPECT_LE(length, capacity);
            if (result == PUB_ERR_NONE) {
                EXPECT_EQ(length, needed);
            } else {
                EXPECT_TRUE(m_log.has("block of " + std::to_string(capacity) + " bytes is full"));
            }
        }
    }
}

/* Any packet that the adders build converts to exactly its values in order. */
TEST_F(amt_convert_req, random_packets_become_their_values)
{
    std::mt19937 random(4);
    for (int round = 0; round < 500; round++) {
        const uint8_t cmd =
            random() % 2 == 0 ? AMT_DSP_TRANSPARENT_CONTROL_CMD : static_cast<uint8_t>(random());
        amt_packet_init(packet(), cmd);
        std::vector<uint8_t> expected = {cmd};
        while (amt_packet_has_room(packet(), 400)) {
            const uint8_t *const atom = amt_packet_get_end(packet());
            std::vector<uint8_t> data(1 + random() % 400, static_cast<uint8_t>(random()));
            switch (random() % 3) {
            case 0:
                amt_packet_add_int(packet(), 1, static_cast<int32_t>(random()));
                break;
            case 1:
                amt_packet_add_bool(packet(), 2, static_cast<int32_t>(random()));
                break;
            default:
                amt_packet_add_bytes(packet(), 3, data.data(), static_cast<uint16_t>(data.size()));
                break;
            }
            const uint8_t *const end = amt_packet_get_end(packet());
            expected.insert(expected.end(), cmd == 0x97 ? atom + 3 : atom + 5, end);
        }
        ASSERT_EQ(convert(), PUB_ERR_NONE);
        ASSERT_EQ(block(), expected);
    }
}

} // namespace
