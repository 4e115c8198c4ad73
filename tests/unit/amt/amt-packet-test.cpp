#include "amt/amt-packet.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <random>
#include <string.h>
#include <string>
#include <vector>

#include "tests/unit/support/guarded-area.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;

/* A started packet in an area that faults on both sides. */
class amt_packet : public ::testing::Test {
protected:
    amt_packet() : m_area(AMT_PACKET_SIZE)
    {
        amt_packet_init(packet(), 0x0A);
    }

    uint8_t *packet() const
    {
        return m_area.data();
    }

    /* What is in use: header and atoms. */
    std::vector<uint8_t> used() const
    {
        return m_area.head(amt_packet_get_length(packet()));
    }

    std::vector<uint8_t> atoms() const
    {
        const std::vector<uint8_t> all = used();
        return std::vector<uint8_t>(all.begin() + AMT_PACKET_HEADER_SIZE, all.end());
    }

    guarded_area_c m_area;
};

TEST_F(amt_packet, init_resets_the_whole_area)
{
    memset(packet(), 0x5A, AMT_PACKET_SIZE);

    EXPECT_EQ(amt_packet_init(packet(), 0x0A), 0);

    EXPECT_THAT(m_area.head(6), ElementsAre(0x06, 0x00, 0xBB, 0x0A, 0x00, 0x00));
    const std::vector<uint8_t> all = m_area.content();
    EXPECT_THAT(std::vector<uint8_t>(all.begin() + 6, all.end()), Each(0));
    EXPECT_EQ(amt_packet_get_cmd(packet()), 0x0A);
    EXPECT_EQ(amt_packet_get_length(packet()), 6);
    EXPECT_EQ(amt_packet_get_end(packet()), packet() + 6);
}

TEST_F(amt_packet, init_takes_every_command_id)
{
    for (int cmd = 0; cmd <= UINT8_MAX; cmd++) {
        amt_packet_init(packet(), static_cast<uint8_t>(cmd));
        EXPECT_EQ(amt_packet_get_cmd(packet()), cmd);
        EXPECT_EQ(packet()[2], 0xBB);
    }
}

TEST_F(amt_packet, clear_zeroes_what_it_is_told_to)
{
    uint8_t data_a[4] = {1, 2, 3, 4};
    amt_packet_clear(data_a, 0);
    EXPECT_THAT(data_a, ElementsAre(1, 2, 3, 4));
    amt_packet_clear(data_a, 3);
    EXPECT_THAT(data_a, ElementsAre(0, 0, 0, 4));
    amt_packet_clear(nullptr, 3);
}

TEST_F(amt_packet, integer_atom)
{
    amt_packet_add_int(packet(), 5, 0x01020304);

    EXPECT_THAT(used(), ElementsAre(0x0F, 0x00, 0xBB, 0x0A, 0x09, 0x00, /* atom */ 0xEE, 0x05, 0x01, 0x04,
                                    0x00, 0x04, 0x03, 0x02, 0x01));
    EXPECT_EQ(amt_packet_get_length(packet()), 15);
    EXPECT_EQ(amt_packet_get_end(packet()), packet() + 15);
    EXPECT_EQ(amt_packet_get_int(packet(), 5), 0x01020304);
}

TEST_F(amt_packet, integers_come_back)
{
    for (const int32_t value : {0, 1, -1, 255, 256, -256, INT_MAX, INT_MIN, 0x12345678}) {
        amt_packet_init(packet(), 1);
        amt_packet_add_int(packet(), 200, value);
        EXPECT_EQ(amt_packet_get_int(packet(), 200), value);
    }
}

TEST_F(amt_packet, boolean_atom_keeps_the_low_byte)
{
    amt_packet_add_bool(packet(), 41, 0x1FF);

    EXPECT_THAT(atoms(), ElementsAre(0xEE, 41, 0x04, 0x01, 0x00, 0xFF));
    EXPECT_EQ(amt_packet_get_length(packet()), 12);
    EXPECT_EQ(amt_packet_get_bool(packet(), 41), 255);
}

TEST_F(amt_packet, boolean_getter_gives_the_byte_of_a_boolean_atom)
{
    for (int value = 0; value <= UINT8_MAX; value++) {
        amt_packet_init(packet(), 1);
        amt_packet_add_bool(packet(), 2, value);
        EXPECT_EQ(amt_packet_get_bool(packet(), 2), value);
        EXPECT_EQ(amt_packet_get_int(packet(), 2), value);
    }
}

TEST_F(amt_packet, string_atom)
{
    amt_packet_add_string(packet(), 18, "AMT");
    EXPECT_THAT(atoms(), ElementsAre(0xEE, 18, 0x02, 0x03, 0x00, 'A', 'M', 'T'));
}

TEST_F(amt_packet, empty_string_atom)
{
    amt_packet_add_string(packet(), 18, "");
    EXPECT_THAT(atoms(), ElementsAre(0xEE, 18, 0x02, 0x00, 0x00));
}

TEST_F(amt_packet, bytes_atom)
{
    const uint8_t data_a[] = {0x00, 0xEE, 0xFF};
    amt_packet_add_bytes(packet(), 4, data_a, 3);
    EXPECT_THAT(atoms(), ElementsAre(0xEE, 4, 0x03, 0x03, 0x00, 0x00, 0xEE, 0xFF));
}

TEST_F(amt_packet, empty_bytes_atom)
{
    const uint8_t data = 7;
    amt_packet_add_bytes(packet(), 4, &data, 0);
    EXPECT_THAT(atoms(), ElementsAre(0xEE, 4, 0x03, 0x00, 0x00));
}

TEST_F(amt_packet, absent_text_or_data_adds_nothing)
{
    amt_packet_add_string(packet(), 1, nullptr);
    amt_packet_add_bytes(packet(), 1, nullptr, 0);
    amt_packet_add_bytes(packet(), 1, nullptr, 4);
    EXPECT_THAT(used(), ElementsAre(0x06, 0x00, 0xBB, 0x0A, 0x00, 0x00));
}

TEST_F(amt_packet, length_of_a_long_value_takes_both_bytes)
{
    const std::vector<uint8_t> data(0x0102, 0x33);
    amt_packet_add_bytes(packet(), 4, data.data(), 0x0102);
    EXPECT_EQ(packet()[9], 0x02);
    EXPECT_EQ(packet()[10], 0x01);
    EXPECT_EQ(amt_packet_get_length(packet()), 6 + 5 + 0x0102);
    EXPECT_EQ(packet()[0], 0x0D);
    EXPECT_EQ(packet()[1], 0x01);
    EXPECT_EQ(packet()[4], 0x07);
    EXPECT_EQ(packet()[5], 0x01);
}

TEST_F(amt_packet, atoms_stand_back_to_back_in_order)
{
    amt_packet_add_bool(packet(), 1, 9);
    amt_packet_add_string(packet(), 2, "x");
    amt_packet_add_int(packet(), 3, -2);

    EXPECT_THAT(atoms(), ElementsAre(0xEE, 1, 4, 1, 0, 9, 0xEE, 2, 2, 1, 0, 'x', 0xEE, 3, 1, 4, 0, 0xFE, 0xFF,
                                     0xFF, 0xFF));
    EXPECT_EQ(amt_packet_find_atom(packet(), 1), packet() + 6 + 3);
    EXPECT_EQ(amt_packet_find_atom(packet(), 2), packet() + 12 + 3);
    EXPECT_EQ(amt_packet_find_atom(packet(), 3), packet() + 18 + 3);
    EXPECT_EQ(amt_packet_find_atom(packet(), 4), nullptr);
}

TEST_F(amt_packet, first_of_two_atoms_with_one_id_wins)
{
    amt_packet_add_int(packet(), 7, 1);
    amt_packet_add_int(packet(), 7, 2);
    EXPECT_EQ(amt_packet_get_int(packet(), 7), 1);
}

TEST_F(amt_packet, search_ends_at_a_foreign_head_byte)
{
    amt_packet_add_int(packet(), 1, 11);
    amt_packet_add_int(packet(), 2, 22);
    amt_packet_add_int(packet(), 3, 33);
    packet()[6 + 9] = 0xED;

    EXPECT_EQ(amt_packet_get_int(packet(), 1), 11);
    EXPECT_EQ(amt_packet_find_atom(packet(), 2), nullptr);
    EXPECT_EQ(amt_packet_find_atom(packet(), 3), nullptr);
    EXPECT_EQ(amt_packet_get_int(packet(), 3), 0);
    EXPECT_EQ(amt_packet_get_bool(packet(), 3), 1);
}

TEST_F(amt_packet, search_ends_at_the_atom_length_not_at_the_total_length)
{
    amt_packet_add_int(packet(), 1, 11);
    amt_packet_add_int(packet(), 2, 22);
    packet()[4] = 9;
    EXPECT_EQ(amt_packet_find_atom(packet(), 2), nullptr);
    packet()[4] = 10; /* the atom's first byte lies within the limit */
    EXPECT_NE(amt_packet_find_atom(packet(), 2), nullptr);
    packet()[0] = 0; /* the total length plays no part */
    EXPECT_NE(amt_packet_find_atom(packet(), 2), nullptr);
}

TEST_F(amt_packet, missing_number_is_0_and_missing_switch_is_on)
{
    EXPECT_EQ(amt_packet_get_int(packet(), 1), 0);
    EXPECT_EQ(amt_packet_get_bool(packet(), 1), 1);
}

TEST_F(amt_packet, short_values_replace_the_low_bytes_of_the_default)
{
    const uint8_t data_a[] = {0xAA, 0xBB, 0xCC, 0x0D};
    const int32_t int_a[] = {0, 0xAA, 0xBBAA, 0xCCBBAA, 0x0DCCBBAA};
    const int32_t bool_a[] = {1, 0xAA, 0xBBAA, 0xCCBBAA, 0x0DCCBBAA};
    for (uint16_t n = 0; n <= 4; n++) {
        amt_packet_init(packet(), 1);
        amt_packet_add_bytes(packet(), 2, data_a, n);
        EXPECT_EQ(amt_packet_get_int(packet(), 2), int_a[n]) << n;
        EXPECT_EQ(amt_packet_get_bool(packet(), 2), bool_a[n]) << n;
    }
}

TEST_F(amt_packet, bytes_getter_over_every_size_around_the_capacity)
{
    for (uint16_t n = 0; n < 40; n++) {
        std::vector<uint8_t> value(n);
        for (uint16_t i = 0; i < n; i++) {
            value[i] = static_cast<uint8_t>(i + 1);
        }
        amt_packet_init(packet(), 1);
        amt_packet_add_bytes(packet(), 9, n == 0 ? packet() : value.data(), n);
        EXPECT_EQ(amt_packet_get_bytes(packet(), 9, nullptr, 0), n);
        EXPECT_EQ(amt_packet_get_bytes(packet(), 9, nullptr, 5), 0U);
        for (uint32_t capacity = 1; capacity < 44; capacity++) {
            const guarded_area_c dst(std::vector<uint8_t>(capacity, 0x77));
            const uint32_t expected = n < capacity ? n : capacity;
            EXPECT_EQ(amt_packet_get_bytes(packet(), 9, dst.data(), capacity), expected);
            std::vector<uint8_t> content(value.begin(), value.begin() + expected);
            content.resize(capacity);
            EXPECT_EQ(dst.content(), content) << n << " into " << capacity;
        }
    }
}

TEST_F(amt_packet, string_getter_over_every_size_around_the_capacity)
{
    for (uint16_t n = 0; n < 40; n++) {
        const std::string text = std::string("abcdefghijklmnopqrstuvwxyz0123456789ABCDEFGH").substr(0, n);
        amt_packet_init(packet(), 1);
        amt_packet_add_string(packet(), 9, text.c_str());
        EXPECT_EQ(amt_packet_get_string(packet(), 9, nullptr, 0), n + 1U);
        EXPECT_EQ(amt_packet_get_string(packet(), 9, nullptr, 5), 0U);
        for (uint32_t capacity = 1; capacity < 44; capacity++) {
            const guarded_area_c dst(std::vector<uint8_t>(capacity, 0x77));
            const uint32_t expected = capacity < n ? capacity - 1 : n;
            char *dst_ptr = reinterpret_cast<char *>(dst.data());
            EXPECT_EQ(amt_packet_get_string(packet(), 9, dst_ptr, capacity), expected);
            std::vector<uint8_t> content(text.begin(), text.begin() + expected);
            content.resize(capacity);
            EXPECT_EQ(dst.content(), content) << n << " into " << capacity;
        }
    }
}

TEST_F(amt_packet, string_getter_with_the_capacity_of_the_text_leaves_no_terminator)
{
    amt_packet_add_string(packet(), 9, "ABCDEF");
    char dst_a[7] = "??????";

    EXPECT_EQ(amt_packet_get_string(packet(), 9, nullptr, 0), 7U);
    EXPECT_EQ(amt_packet_get_string(packet(), 9, dst_a, 4), 3U);
    EXPECT_THAT(dst_a, ElementsAre('A', 'B', 'C', '\0', '?', '?', '\0'));
    dst_a[6] = '!';
    EXPECT_EQ(amt_packet_get_string(packet(), 9, dst_a, 6), 6U);
    EXPECT_THAT(dst_a, ElementsAre('A', 'B', 'C', 'D', 'E', 'F', '!'));
}

TEST_F(amt_packet, getters_of_a_missing_atom_leave_the_destination_alone)
{
    uint8_t bytes_a[2] = {1, 2};
    char text_a[2] = {'a', 'b'};
    EXPECT_EQ(amt_packet_get_bytes(packet(), 9, bytes_a, 2), 0U);
    EXPECT_EQ(amt_packet_get_bytes(packet(), 9, bytes_a, 0), 0U);
    EXPECT_EQ(amt_packet_get_string(packet(), 9, text_a, 2), 0U);
    EXPECT_EQ(amt_packet_get_string(packet(), 9, text_a, 0), 0U);
    EXPECT_THAT(bytes_a, ElementsAre(1, 2));
    EXPECT_THAT(text_a, ElementsAre('a', 'b'));
}

TEST_F(amt_packet, getters_of_texts_and_bytes_do_not_look_at_the_type)
{
    amt_packet_add_int(packet(), 9, 0x44434241);
    uint8_t bytes_a[4] = {};
    char text_a[5] = "";
    EXPECT_EQ(amt_packet_get_bytes(packet(), 9, bytes_a, 4), 4U);
    EXPECT_EQ(amt_packet_get_string(packet(), 9, text_a, 5), 4U);
    EXPECT_THAT(bytes_a, ElementsAre('A', 'B', 'C', 'D'));
    EXPECT_STREQ(text_a, "ABCD");
}

TEST_F(amt_packet, add_length_wraps_at_16_bits)
{
    EXPECT_EQ(amt_packet_add_length(packet(), 10), 10);
    EXPECT_EQ(amt_packet_get_length(packet()), 16);
    EXPECT_EQ(amt_packet_add_length(packet(), 65519), 65529);
    EXPECT_EQ(amt_packet_get_length(packet()), 65535);
    EXPECT_EQ(amt_packet_add_length(packet(), 1), 65530); /* 0 - 6 */
    EXPECT_EQ(amt_packet_get_length(packet()), 0);
    EXPECT_EQ(packet()[4], 0xFA);
    EXPECT_EQ(packet()[5], 0xFF);
    EXPECT_EQ(amt_packet_add_length(packet(), 6), 0);
}

TEST(amt_packet_absent, every_operation_accepts_it)
{
    uint8_t data = 0;
    char text = 0;
    EXPECT_EQ(amt_packet_init(nullptr, 1), 0);
    EXPECT_EQ(amt_packet_get_cmd(nullptr), 0);
    EXPECT_EQ(amt_packet_get_length(nullptr), 0);
    EXPECT_EQ(amt_packet_get_end(nullptr), nullptr);
    EXPECT_EQ(amt_packet_add_length(nullptr, 9), 0);
    EXPECT_FALSE(amt_packet_has_room(nullptr, 0));
    amt_packet_add_int(nullptr, 1, 1);
    amt_packet_add_bool(nullptr, 1, 1);
    amt_packet_add_string(nullptr, 1, "a");
    amt_packet_add_bytes(nullptr, 1, &data, 1);
    EXPECT_EQ(amt_packet_find_atom(nullptr, 1), nullptr);
    EXPECT_EQ(amt_packet_get_int(nullptr, 1), 0);
    EXPECT_EQ(amt_packet_get_bool(nullptr, 1), 1);
    EXPECT_EQ(amt_packet_get_bytes(nullptr, 1, &data, 1), 0U);
    EXPECT_EQ(amt_packet_get_string(nullptr, 1, &text, 1), 0U);
}

/* Whatever is added comes back unchanged, at any odd or even place. */
TEST_F(amt_packet, random_atoms_come_back)
{
    std::mt19937 random(1);
    for (int round = 0; round < 300; round++) {
        amt_packet_init(packet(), static_cast<uint8_t>(random()));
        std::vector<std::vector<uint8_t>> value_list;
        for (int id = 0; id < 12; id++) {
            std::vector<uint8_t> value(1 + random() % 300);
            for (uint8_t &byte : value) {
                byte = static_cast<uint8_t>(random());
            }
            ASSERT_TRUE(amt_packet_has_room(packet(), static_cast<uint32_t>(value.size())));
            amt_packet_add_bytes(packet(), static_cast<uint8_t>(id), value.data(),
                                 static_cast<uint16_t>(value.size()));
            value_list.push_back(value);
        }
        for (int id = 0; id < 12; id++) {
            const std::vector<uint8_t> &value = value_list[static_cast<size_t>(id)];
            std::vector<uint8_t> read(value.size());
            EXPECT_EQ(amt_packet_get_bytes(packet(), static_cast<uint8_t>(id), read.data(),
                                           static_cast<uint32_t>(read.size())),
                      value.size());
            EXPECT_EQ(read, value);
        }
    }
}

} // namespace
