#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <random>
#include <set>
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

using ::testing::Each;
using ::testing::ElementsAre;

const std::string FUNC = "amt_convert_rsp_at_data_2_amt_data";
const std::string ENTRY = FUNC + "()";
const std::string INT_STEP = "rsp_at_data_2_amt_data_atom_int";
const std::string BOOL_STEP = "rsp_at_data_2_amt_data_atom_bool";
const std::string BYTE_STEP = "rsp_at_data_2_amt_data_atom_byte";

std::string convert_error(const std::string &func, int code)
{
    return error_line("amt/amt-convert", func, code);
}

class amt_convert_rsp : public ::testing::Test {
protected:
    amt_convert_rsp() : m_packet(AMT_PACKET_SIZE)
    {
        memset(packet(), 0x5A, AMT_PACKET_SIZE);
        errno = 0;
    }

    uint8_t *packet() const
    {
        return m_packet.data();
    }

    /* Converts a block of exactly these bytes: a read behind them would fault. */
    int convert(const std::vector<uint8_t> &block)
    {
        const guarded_area_c area(block);
        return amt_convert_rsp_at_data_2_amt_data(area.data(), area.size(), packet(), AMT_PACKET_SIZE);
    }

    /* The same block at the start of an area of 4096 bytes, as the service has it. */
    int convert_in_area(std::vector<uint8_t> block)
    {
        const uint32_t length = static_cast<uint32_t>(block.size());
        block.resize(AMT_PACKET_SIZE);
        const guarded_area_c area(block);
        return amt_convert_rsp_at_data_2_amt_data(area.data(), length, packet(), AMT_PACKET_SIZE);
    }

    std::vector<uint8_t> used() const
    {
        return m_packet.head(amt_packet_get_length(packet()));
    }

    /* The value of an atom. */
    std::vector<uint8_t> value(uint8_t atom_id) const
    {
        std::vector<uint8_t> data(amt_packet_get_bytes(packet(), atom_id, nullptr, 0));
        amt_packet_get_bytes(packet(), atom_id, data.data(), static_cast<uint32_t>(data.size()));
        return data;
    }

    /* The type of an atom; 0 when it is missing. */
    int type(uint8_t atom_id) const
    {
        const uint8_t *length_field = amt_packet_find_atom(packet(), atom_id);
        return length_field == nullptr ? 0 : length_field[-1];
    }

    log_capture_c m_log;
    guarded_area_c m_packet;
};

/* A block: command, result code 0x01020304, then the fields. */
std::vector<uint8_t> block_of(uint8_t cmd, const std::vector<uint8_t> &fields)
{
    std::vector<uint8_t> block = {cmd, 1, 2, 3, 4};
    block.insert(block.end(), fields.begin(), fields.end());
    return block;
}

std::vector<uint8_t> counted_bytes(uint32_t count)
{
    std::vector<uint8_t> data(count);
    for (uint32_t i = 0; i < count; i++) {
        data[i] = static_cast<uint8_t>(i + 1);
    }
    return data;
}

std::vector<uint8_t> operator+(std::vector<uint8_t> left, const std::vector<uint8_t> &right)
{
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

std::vector<uint8_t> u32_le(uint32_t number)
{
    std::vector<uint8_t> field(4);
    amt_put_u32_le(field.data(), number);
    return field;
}

std::vector<uint8_t> u16_le(uint16_t number)
{
    std::vector<uint8_t> field(2);
    amt_put_u16_le(field.data(), number);
    return field;
}

TEST_F(amt_convert_rsp, integer_response)
{
    EXPECT_EQ(convert({0x1A, 0, 0, 0, 0, 0, 0, 0, 0x2A}), PUB_ERR_NONE);

    EXPECT_THAT(used(), ElementsAre(24, 0, 0xBB, 0x1A, 18, 0, /* result */ 0xEE, 1, 1, 4, 0, 0, 0, 0, 0,
                                    /* power */ 0xEE, 13, 1, 4, 0, 0x2A, 0, 0, 0));
    const std::vector<uint8_t> all = m_packet.content();
    EXPECT_THAT(std::vector<uint8_t>(all.begin() + 24, all.end()), Each(0));
    EXPECT_THAT(without_line_numbers(m_log), ElementsAre(ENTRY));
    EXPECT_EQ(m_log.records()[0].m_tag, "vx-kel-amt");
    EXPECT_EQ(m_log.records()[0].m_priority, 3);
}

TEST_F(amt_convert_rsp, result_code_is_big_endian)
{
    EXPECT_EQ(convert({0x30, 0xFF, 0xFE, 0xFD, 0xFC}), PUB_ERR_NONE);
    EXPECT_THAT(used(), ElementsAre(15, 0, 0xBB, 0x30, 9, 0, 0xEE, 1, 1, 4, 0, 0xFC, 0xFD, 0xFE, 0xFF));
}

TEST_F(amt_convert_rsp, block_that_ends_with_the_result_has_no_more_atoms)
{
    for (int cmd = 0; cmd <= UINT8_MAX; cmd++) {
        EXPECT_EQ(convert(block_of(static_cast<uint8_t>(cmd), {})), PUB_ERR_NONE) << cmd;
        EXPECT_EQ(amt_packet_get_length(packet()), 15) << cmd;
        EXPECT_EQ(amt_packet_get_cmd(packet()), cmd);
        EXPECT_EQ(amt_packet_get_int(packet(), 1), 0x01020304);
    }
}

TEST_F(amt_convert_rsp, result_that_the_block_cuts_ends_in_zero_bytes)
{
    const int32_t result_a[] = {0, 0x11000000, 0x11220000, 0x11223300, 0x11223344};
    const std::vector<uint8_t> whole = {0x30, 0x11, 0x22, 0x33, 0x44};
    for (uint32_t length = 1; length <= 5; length++) {
        EXPECT_EQ(convert({whole.begin(), whole.begin() + length}), PUB_ERR_NONE);
        EXPECT_EQ(amt_packet_get_int(packet(), 1), result_a[length - 1]);
        EXPECT_EQ(amt_packet_get_length(packet()), 15);
    }
}

struct row_case_st
{
    uint8_t m_cmd;
    int m_int_atom; /* 0: none */
    int m_bool_atom;
    int m_bytes_atom;
    uint32_t m_length_size; /* of the count of bytes: 0 for a fixed one */
    uint32_t m_fixed_count;
};

const row_case_st g_row_case_a[] = {
    {0x08, 0, 0, 21, 0, 15}, {0x18, 12, 0, 4, 4, 0}, {0x1A, 13, 0, 0, 0, 0}, {0x2E, 19, 0, 18, 0, 64},
    {0x30, 0, 0, 4, 4, 0},   {0x3E, 0, 0, 4, 4, 0},  {0x72, 0, 0, 4, 4, 0},  {0x3C, 24, 0, 0, 0, 0},
    {0x4E, 0, 0, 34, 4, 0},  {0x64, 0, 41, 0, 0, 0}, {0x6A, 0, 0, 43, 4, 0}, {0x6E, 0, 44, 0, 0, 0},
    {0x98, 0, 0, 62, 2, 0},  {0xDD, 0, 0, 62, 2, 0},
};

/* The fields of a row, its bytes of this count (fixed counts stay), and what must come out. */
std::vector<uint8_t> fields_of(const row_case_st &row, uint32_t count)
{
    std::vector<uint8_t> fields;
    if (row.m_int_atom != 0) {
        fields = fields + std::vector<uint8_t>{0x80, 0x00, 0x00, 0x2A};
    }
    if (row.m_bool_atom != 0) {
        fields = fields + std::vector<uint8_t>{0xC3};
    }
    if (row.m_length_size == 4) {
        fields = fields + u32_le(count);
    } else if (row.m_length_size == 2) {
        fields = fields + u16_le(static_cast<uint16_t>(count));
    }
    return row.m_bytes_atom == 0 ? fields : fields + counted_bytes(count);
}

TEST_F(amt_convert_rsp, every_row)
{
    for (const row_case_st &row : g_row_case_a) {
        SCOPED_TRACE(static_cast<int>(row.m_cmd));
        const uint32_t count = row.m_fixed_count != 0 ? row.m_fixed_count : 300;
        EXPECT_EQ(convert(block_of(row.m_cmd, fields_of(row, count))), PUB_ERR_NONE);
        const std::vector<uint8_t> from_exact = m_packet.content();

        uint32_t length = 15;
        EXPECT_EQ(amt_packet_get_int(packet(), 1), 0x01020304);
        if (row.m_int_atom != 0) {
            EXPECT_EQ(type(static_cast<uint8_t>(row.m_int_atom)), 1);
            EXPECT_EQ(amt_packet_get_int(packet(), static_cast<uint8_t>(row.m_int_atom)), INT32_MIN + 42);
            length += 9;
        }
        if (row.m_bool_atom != 0) {
            EXPECT_EQ(type(static_cast<uint8_t>(row.m_bool_atom)), 4);
            EXPECT_EQ(amt_packet_get_bool(packet(), static_cast<uint8_t>(row.m_bool_atom)), 0xC3);
            length += 6;
        }
        if (row.m_bytes_atom != 0) {
            EXPECT_EQ(type(static_cast<uint8_t>(row.m_bytes_atom)), 3);
            EXPECT_EQ(value(static_cast<uint8_t>(row.m_bytes_atom)), counted_bytes(count));
            length += 5 + count;
        }
        EXPECT_EQ(amt_packet_get_length(packet()), length);

        EXPECT_EQ(convert_in_area(block_of(row.m_cmd, fields_of(row, count))), PUB_ERR_NONE);
        EXPECT_EQ(m_packet.content(), from_exact);
    }
}

TEST_F(amt_convert_rsp, integer_comes_before_the_bytes)
{
    EXPECT_EQ(convert(block_of(0x18, {0, 0, 0, 7, 1, 0, 0, 0, 0x99})), PUB_ERR_NONE);
    EXPECT_THAT(used(), ElementsAre(30, 0, 0xBB, 0x18, 24, 0, 0xEE, 1, 1, 4, 0, 4, 3, 2, 1, /* */ 0xEE, 12, 1,
                                    4, 0, 7, 0, 0, 0, /* */ 0xEE, 4, 3, 1, 0, 0x99));
}

TEST_F(amt_convert_rsp, ids_without_a_row_read_nothing_more)
{
    std::set<int> row_set;
    for (const row_case_st &row : g_row_case_a) {
        row_set.insert(row.m_cmd);
    }
    EXPECT_EQ(row_set.size(), 14U);
    for (int cmd = 0; cmd <= UINT8_MAX; cmd++) {
        EXPECT_EQ(convert(block_of(static_cast<uint8_t>(cmd), counted_bytes(100))) == PUB_ERR_NONE &&
                      amt_packet_get_length(packet()) == 15,
                  row_set.count(cmd) == 0)
            << cmd;
    }
}

TEST_F(amt_convert_rsp, length_field_of_0_is_refused)
{
    EXPECT_EQ(convert(block_of(0x30, {0, 0, 0, 0})), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(ENTRY, convert_error(BYTE_STEP, -101), "0, 0, 0, 1, 0"));
    EXPECT_EQ(amt_packet_get_int(packet(), 1), 0x01020304);

    for (const row_case_st &row : g_row_case_a) {
        if (row.m_length_size != 0) {
            EXPECT_EQ(convert(block_of(row.m_cmd, fields_of(row, 0) + std::vector<uint8_t>{1, 2})),
                      PUB_ERR_PARAM);
            EXPECT_EQ(amt_packet_get_length(packet()), row.m_int_atom != 0 ? 24 : 15); /* the integer stays */
        }
    }
}

TEST_F(amt_convert_rsp, fields_behind_the_block_read_as_zero_bytes)
{
    EXPECT_EQ(convert(block_of(0x1A, {0x12, 0x34})), PUB_ERR_NONE);
    EXPECT_EQ(amt_packet_get_int(packet(), 13), 0x12340000);

    EXPECT_EQ(convert(block_of(0x08, {'1', '2'})), PUB_ERR_NONE);
    EXPECT_EQ(value(21), (std::vector<uint8_t>{'1', '2'} + std::vector<uint8_t>(13)));

    EXPECT_EQ(convert(block_of(0x30, {0x03})), PUB_ERR_NONE);
    EXPECT_EQ(value(4), std::vector<uint8_t>(3));

    EXPECT_EQ(convert(block_of(0x18, {0, 0, 0, 1})), PUB_ERR_PARAM); /* the length field reads as 0 */
    EXPECT_EQ(amt_packet_get_int(packet(), 12), 1);
}

TEST_F(amt_convert_rsp, what_lies_behind_the_block_in_its_area_is_not_read)
{
    std::vector<uint8_t> area = block_of(0x30, {0x03, 0, 0, 0, 0x99}) + std::vector<uint8_t>(50, 0x77);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(area.data(), 10, packet(), AMT_PACKET_SIZE), PUB_ERR_NONE);
    EXPECT_THAT(value(4), ElementsAre(0x99, 0, 0));
}

TEST_F(amt_convert_rsp, counts_up_to_the_packet_fit_and_longer_ones_are_refused)
{
    for (const row_case_st &row : g_row_case_a) {
        if (row.m_length_size == 0) {
            continue;
        }
        SCOPED_TRACE(static_cast<int>(row.m_cmd));
        const uint32_t most = row.m_int_atom != 0 ? 4067 : 4076;
        const uint8_t atom_id = static_cast<uint8_t>(row.m_bytes_atom);
        for (const uint32_t count : {1U, 255U, 256U, most - 1, most}) {
            EXPECT_EQ(convert(block_of(row.m_cmd, fields_of(row, count))), PUB_ERR_NONE) << count;
            EXPECT_EQ(value(atom_id), counted_bytes(count)) << count;
        }
        EXPECT_EQ(amt_packet_get_length(packet()), AMT_PACKET_SIZE);
        for (const uint32_t count : {most + 1, 4096U, 0x7FFFU, 0xFFFFU}) {
            EXPECT_EQ(convert(block_of(row.m_cmd, fields_of(row, count))), PUB_ERR_FAIL) << count;
            EXPECT_EQ(amt_packet_find_atom(packet(), atom_id), nullptr) << count;
            EXPECT_TRUE(m_log.has("atom of " + std::to_string(count) + " bytes does not fit the packet"));
        }
    }
    const std::vector<std::string> text_list = without_line_numbers(m_log);
    EXPECT_THAT(text_list, ::testing::Contains(convert_error(BYTE_STEP, -100)));
}

TEST_F(amt_convert_rsp, hostile_32_bit_counts_are_refused)
{
    for (const uint32_t count : {0x10000U, 0x10001U, 0x7FFFFFFFU, 0x80000000U, 0xFFFFFFF0U, 0xFFFFFFFFU}) {
        for (const uint8_t cmd : std::initializer_list<uint8_t>{0x18, 0x30, 0x3E, 0x72, 0x4E, 0x6A}) {
            std::vector<uint8_t> fields = u32_le(count) + counted_bytes(20);
            if (cmd == 0x18) {
                fields = std::vector<uint8_t>{0, 0, 0, 1} + fields;
            }
            EXPECT_EQ(convert(block_of(cmd, fields)), PUB_ERR_FAIL) << count;
            EXPECT_EQ(convert_in_area(block_of(cmd, fields)), PUB_ERR_FAIL) << count;
        }
    }
}

TEST_F(amt_convert_rsp, block_longer_than_its_area_is_read_to_the_areas_end)
{
    const std::vector<uint8_t> block =
        block_of(0x30, u32_le(4076) + counted_bytes(4076)) + std::vector<uint8_t>(5000);
    EXPECT_EQ(convert(block), PUB_ERR_NONE);
    EXPECT_EQ(value(4), counted_bytes(4076));
}

/* Where addresses have 32 bits, such a length added to one leads around. */
TEST_F(amt_convert_rsp, block_that_claims_the_longest_length_is_read_too)
{
    const std::vector<uint8_t> block =
        block_of(0x30, u32_le(4076) + counted_bytes(4076)) + std::vector<uint8_t>(5000);
    std::vector<uint8_t> packet(AMT_PACKET_SIZE);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(block.data(), UINT32_MAX, packet.data(), AMT_PACKET_SIZE),
              PUB_ERR_NONE);
    EXPECT_EQ(amt_packet_get_bytes(packet.data(), 4, nullptr, 0), 4076U);
}

TEST_F(amt_convert_rsp, absent_arguments_and_foreign_capacities_are_refused)
{
    const uint8_t block_a[] = {0x1A, 0, 0, 0, 0};
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(nullptr, 5, packet(), 4096), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(block_a, 0, packet(), 4096), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(block_a, 5, nullptr, 4096), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(block_a, 5, packet(), 4095), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(block_a, 5, packet(), 4097), PUB_ERR_PARAM);
    EXPECT_EQ(amt_convert_rsp_at_data_2_amt_data(block_a, 5, packet(), 0), PUB_ERR_PARAM);

    const std::string error = convert_error(FUNC, -101);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(ENTRY, error, "1, 0, 0, 0", ENTRY, error, "0, 1, 0, 0", ENTRY, error,
                            "0, 0, 1, 0", ENTRY, error, "0, 0, 0, 1", ENTRY, error, "0, 0, 0, 1", ENTRY,
                            error, "0, 0, 0, 1"));
    EXPECT_THAT(m_packet.content(), Each(0x5A));
}

TEST_F(amt_convert_rsp, steps_advance_the_cursor_and_add_one_atom)
{
    const guarded_area_c block(std::vector<uint8_t>{0x12, 0x34, 0x56, 0x78, 0x05, 'a', 'b', 'c'});
    const uint8_t *cursor = block.data();
    amt_packet_init(packet(), 1);

    EXPECT_EQ(rsp_at_data_2_amt_data_atom_int(&cursor, packet(), 20), PUB_ERR_NONE);
    EXPECT_EQ(cursor, block.data() + 4);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_bool(&cursor, packet(), 21), PUB_ERR_NONE);
    EXPECT_EQ(cursor, block.data() + 5);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(&cursor, packet(), 3, 22), PUB_ERR_NONE);
    EXPECT_EQ(cursor, block.data() + 8);

    EXPECT_EQ(amt_packet_get_int(packet(), 20), 0x12345678);
    EXPECT_EQ(amt_packet_get_bool(packet(), 21), 5);
    EXPECT_THAT(value(22), ElementsAre('a', 'b', 'c'));
    EXPECT_EQ(type(20), 1);
    EXPECT_EQ(type(21), 4);
    EXPECT_EQ(type(22), 3);
    EXPECT_THAT(m_log.texts(), ElementsAre());
}

TEST_F(amt_convert_rsp, steps_refuse_absent_arguments)
{
    const uint8_t data_a[] = {1, 2, 3, 4};
    const uint8_t *cursor = data_a;
    const uint8_t *absent = nullptr;
    amt_packet_init(packet(), 1);

    EXPECT_EQ(rsp_at_data_2_amt_data_atom_int(nullptr, packet(), 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_int(&absent, packet(), 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_int(&cursor, nullptr, 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_bool(nullptr, packet(), 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_bool(&absent, packet(), 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_bool(&cursor, nullptr, 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(nullptr, packet(), 1, 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(&absent, packet(), 1, 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(&cursor, nullptr, 1, 1), PUB_ERR_PARAM);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(&cursor, packet(), 0, 1), PUB_ERR_PARAM);

    const std::string int_error = convert_error(INT_STEP, -101);
    const std::string bool_error = convert_error(BOOL_STEP, -101);
    const std::string byte_error = convert_error(BYTE_STEP, -101);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre(int_error, "1, 1, 0, 0", int_error, "0, 1, 0, 0", int_error, "0, 0, 1, 0",
                            bool_error, "1, 1, 0, 0", bool_error, "0, 1, 0, 0", bool_error, "0, 0, 1, 0",
                            byte_error, "1, 1, 0, 0, 0", byte_error, "0, 1, 0, 0, 0", byte_error,
                            "0, 0, 1, 0, 0", byte_error, "0, 0, 0, 1, 0"));
    EXPECT_EQ(cursor, data_a);
    EXPECT_EQ(amt_packet_get_length(packet()), 6);
}

TEST_F(amt_convert_rsp, bytes_step_that_does_not_fit_moves_nothing)
{
    const uint8_t data_a[] = {1, 2, 3, 4};
    const uint8_t *cursor = data_a;
    amt_packet_init(packet(), 1);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(&cursor, packet(), 4086, 1), PUB_ERR_FAIL);
    EXPECT_EQ(rsp_at_data_2_amt_data_atom_byte(&cursor, packet(), 0xFFFFFFFFU, 1), PUB_ERR_FAIL);
    EXPECT_EQ(cursor, data_a);
    EXPECT_EQ(amt_packet_get_length(packet()), 6);
}

/* Whatever a modem sends: inside the areas, and one of the three statuses. */
TEST_F(amt_convert_rsp, random_blocks)
{
    std::mt19937 random(5);
    std::set<int> result_set;
    for (int round = 0; round < 20000; round++) {
        std::vector<uint8_t> block(1 + random() % 64);
        for (uint8_t &byte : block) {
            byte = static_cast<uint8_t>(random() % 3 == 0 ? 0 : random());
        }
        block[0] = g_row_case_a[random() % 14].m_cmd;
        const int result = convert(block);
        result_set.insert(result);
        ASSERT_LE(amt_packet_get_length(packet()), AMT_PACKET_SIZE);
        ASSERT_GE(amt_packet_get_length(packet()), 15);
    }
    EXPECT_THAT(result_set, ElementsAre(PUB_ERR_PARAM, PUB_ERR_FAIL, PUB_ERR_NONE));
}

} // namespace
