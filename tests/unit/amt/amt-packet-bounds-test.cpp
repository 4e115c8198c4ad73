#include "amt/amt-packet.h"

#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <random>
#include <signal.h>
#include <string.h>
#include <string>
#include <vector>

#include "amt/amt-byte-order.h"
#include "tests/unit/support/guarded-area.h"

/*
 * Packets whose lengths lie. The area stands between two pages that fault, so a test that ends has stayed
 * inside.
 */
namespace {

class amt_packet_bounds : public ::testing::Test {
protected:
    amt_packet_bounds() : m_area(AMT_PACKET_SIZE)
    {
        amt_packet_init(packet(), 1);
    }

    uint8_t *packet() const
    {
        return m_area.data();
    }

    /* One filling atom (id 1) that ends at offset end, so that the next atom starts there. */
    void fill_up_to(uint32_t end)
    {
        amt_packet_init(packet(), 1);
        set_lengths(static_cast<uint16_t>(end));
        put_atom_head(AMT_PACKET_HEADER_SIZE, 1, static_cast<uint16_t>(end - 11));
    }

    void set_lengths(uint16_t total)
    {
        amt_put_u16_le(packet(), total);
        amt_put_u16_le(packet() + 4, static_cast<uint16_t>(total - 6));
    }

    void claim_everything()
    {
        amt_put_u16_le(packet() + 4, 0xFFFF);
    }

    /* As much of an atom's head as fits the area. */
    void put_atom_head(uint32_t offset, uint8_t id, uint16_t length)
    {
        uint8_t head_a[AMT_ATOM_HEADER_SIZE] = {AMT_ATOM_HEAD, id, AMT_ATOM_TYPE_BYTES};
        amt_put_u16_le(head_a + 3, length);
        for (uint32_t i = 0; i < sizeof(head_a) && offset + i < AMT_PACKET_SIZE; i++) {
            packet()[offset + i] = head_a[i];
        }
    }

    guarded_area_c m_area;
};

struct adder_st
{
    const char *m_name_ptr;
    uint32_t m_size; /* of the whole atom */
    std::function<void(uint8_t *)> m_add;
};

std::vector<adder_st> adders()
{
    static const uint8_t data_a[4] = {1, 2, 3, 4};
    return {
        {"int", 9, [](uint8_t *packet) { amt_packet_add_int(packet, 2, 0x01020304); }},
        {"bool", 6, [](uint8_t *packet) { amt_packet_add_bool(packet, 2, 1); }},
        {"string", 8, [](uint8_t *packet) { amt_packet_add_string(packet, 2, "abc"); }},
        {"empty string", 5, [](uint8_t *packet) { amt_packet_add_string(packet, 2, ""); }},
        {"bytes", 9, [](uint8_t *packet) { amt_packet_add_bytes(packet, 2, data_a, 4); }},
        {"no bytes", 5, [](uint8_t *packet) { amt_packet_add_bytes(packet, 2, data_a, 0); }},
    };
}

TEST_F(amt_packet_bounds, adders_fill_the_area_to_its_last_byte_and_no_further)
{
    for (const adder_st &adder : adders()) {
        for (uint32_t end = 4070; end <= 4110; end++) {
            fill_up_to(end);
            const std::vector<uint8_t> before = m_area.content();
            adder.m_add(packet());
            if (end + adder.m_size <= AMT_PACKET_SIZE) {
                EXPECT_EQ(amt_packet_get_length(packet()), end + adder.m_size)
                    << adder.m_name_ptr << " at " << end;
                EXPECT_NE(amt_packet_find_atom(packet(), 2), nullptr) << adder.m_name_ptr << " at " << end;
            } else {
                EXPECT_EQ(m_area.content(), before) << adder.m_name_ptr << " at " << end;
            }
        }
    }
}

TEST_F(amt_packet_bounds, adders_leave_a_packet_alone_that_claims_to_end_outside)
{
    for (const adder_st &adder : adders()) {
        for (const uint16_t total : std::initializer_list<uint16_t>{4097, 5000, 32768, 65526, 65530, 65535}) {
            amt_packet_init(packet(), 1);
            set_lengths(total);
            const std::vector<uint8_t> before = m_area.content();
            adder.m_add(packet());
            EXPECT_EQ(m_area.content(), before) << adder.m_name_ptr << " at " << total;
            EXPECT_EQ(amt_packet_get_end(packet()), packet() + total);
        }
    }
}

TEST_F(amt_packet_bounds, longest_value_fills_the_area)
{
    const std::vector<uint8_t> data(4086, 0x42);
    EXPECT_TRUE(amt_packet_has_room(packet(), 4085));
    EXPECT_FALSE(amt_packet_has_room(packet(), 4086));
    EXPECT_FALSE(amt_packet_has_room(packet(), 0xFFFFFFFFU));
    amt_packet_add_bytes(packet(), 2, data.data(), 4086);
    EXPECT_EQ(amt_packet_get_length(packet()), 6);
    amt_packet_add_bytes(packet(), 2, data.data(), 4085);
    EXPECT_EQ(amt_packet_get_length(packet()), 4096);
    EXPECT_EQ(packet()[4095], 0x42);
    EXPECT_EQ(amt_packet_get_bytes(packet(), 2, nullptr, 0), 4085U);
}

TEST_F(amt_packet_bounds, text_whose_length_does_not_fit_16_bits_is_not_added)
{
    for (const size_t length : std::initializer_list<size_t>{4086, 65535, 65536, 65540, 131072}) {
        amt_packet_add_string(packet(), 2, std::string(length, 'x').c_str());
        EXPECT_EQ(amt_packet_get_length(packet()), 6) << length;
    }
}

TEST_F(amt_packet_bounds, atom_whose_length_field_passes_the_end_is_absent)
{
    for (uint32_t start = 4085; start < AMT_PACKET_SIZE; start++) {
        fill_up_to(start);
        put_atom_head(start, 2, 0);
        claim_everything();
        const uint8_t *found = amt_packet_find_atom(packet(), 2);
        if (start + 5 <= AMT_PACKET_SIZE) {
            EXPECT_EQ(found, packet() + start + 3) << start;
        } else {
            EXPECT_EQ(found, nullptr) << start;
            EXPECT_EQ(amt_packet_get_int(packet(), 2), 0) << start;
            EXPECT_EQ(amt_packet_get_bool(packet(), 2), 1) << start;
        }
        EXPECT_EQ(amt_packet_find_atom(packet(), 3), nullptr) << start;
    }
}

TEST_F(amt_packet_bounds, lengths_that_wrap_the_position_lead_nowhere)
{
    for (const uint16_t length : std::initializer_list<uint16_t>{4080, 4085, 4086, 4090, 32768, 0xFFF5,
                                                                 0xFFFA, 0xFFFB, 0xFFFC, 0xFFFF})
    {
        amt_packet_init(packet(), 1);
        put_atom_head(6, 1, length);
        claim_everything();
        EXPECT_EQ(amt_packet_find_atom(packet(), 2), nullptr) << length;
        EXPECT_EQ(amt_packet_find_atom(packet(), 1), packet() + 9) << length;
    }
}

TEST_F(amt_packet_bounds, value_bytes_behind_the_area_count_as_zero)
{
    for (uint32_t inside = 0; inside <= 4; inside++) {
        for (uint16_t n = 0; n <= 4; n++) {
            const uint32_t start = AMT_PACKET_SIZE - 5 - inside;
            fill_up_to(start);
            put_atom_head(start, 2, n);
            memset(packet() + start + 5, 0xFF, inside);
            claim_everything();

            uint8_t number_a[4] = {};
            memset(number_a, 0xFF, n < inside ? n : inside);
            const int32_t number = static_cast<int32_t>(amt_get_u32_le(number_a));
            EXPECT_EQ(amt_packet_get_int(packet(), 2), number) << inside << " of " << n;
            EXPECT_EQ(amt_packet_get_bool(packet(), 2), n == 0 ? 1 : number) << inside << " of " << n;
        }
    }
}

TEST_F(amt_packet_bounds, texts_and_bytes_behind_the_area_count_as_zero)
{
    const uint32_t start = AMT_PACKET_SIZE - 5 - 3;
    for (const uint16_t n : std::initializer_list<uint16_t>{3, 4, 100, 4096, 65535}) {
        fill_up_to(start);
        put_atom_head(start, 2, n);
        memset(packet() + start + 5, 'x', 3);
        claim_everything();

        EXPECT_EQ(amt_packet_get_bytes(packet(), 2, nullptr, 0), n);
        EXPECT_EQ(amt_packet_get_string(packet(), 2, nullptr, 0), n + 1U);
        for (const uint32_t capacity : {1U, 2U, 3U, 4U, 5U, 4096U, 70000U}) {
            const guarded_area_c dst(std::vector<uint8_t>(capacity, 0x77));
            std::vector<uint8_t> content(capacity);

            const uint32_t byte_count = n < capacity ? n : capacity;
            std::fill_n(content.begin(), byte_count < 3 ? byte_count : 3, 'x');
            EXPECT_EQ(amt_packet_get_bytes(packet(), 2, dst.data(), capacity), byte_count);
            EXPECT_EQ(dst.content(), content) << n << " into " << capacity;

            const uint32_t text_count = capacity < n ? capacity - 1 : n;
            content.assign(capacity, 0);
            std::fill_n(content.begin(), text_count < 3 ? text_count : 3, 'x');
            char *dst_ptr = reinterpret_cast<char *>(dst.data());
            EXPECT_EQ(amt_packet_get_string(packet(), 2, dst_ptr, capacity), text_count);
            EXPECT_EQ(dst.content(), content) << n << " into " << capacity;
        }
    }
}

using amt_packet_bounds_death_test = amt_packet_bounds;

TEST_F(amt_packet_bounds_death_test, numbers_longer_than_4_bytes_abort)
{
    ::testing::FLAGS_gtest_death_test_style = "threadsafe";
    for (const uint16_t n : std::initializer_list<uint16_t>{5, 6, 4085, 65535}) {
        amt_packet_init(packet(), 1);
        put_atom_head(6, 2, n);
        claim_everything();
        EXPECT_EXIT(amt_packet_get_int(packet(), 2), ::testing::KilledBySignal(SIGABRT), "") << n;
        EXPECT_EXIT(amt_packet_get_bool(packet(), 2), ::testing::KilledBySignal(SIGABRT), "") << n;
    }
    fill_up_to(AMT_PACKET_SIZE - 5);
    put_atom_head(AMT_PACKET_SIZE - 5, 2, 5);
    claim_everything();
    EXPECT_EXIT(amt_packet_get_int(packet(), 2), ::testing::KilledBySignal(SIGABRT), "");
    EXPECT_EXIT(amt_packet_get_bool(packet(), 2), ::testing::KilledBySignal(SIGABRT), "");
}

/* The search as it reads on paper, over a copy with so much room behind it that it cannot leave it. */
const uint8_t *find_on_paper(const std::vector<uint8_t> &roomy, uint8_t id)
{
    const uint16_t limit = amt_get_u16_le(roomy.data() + 4);
    uint16_t p = 0;
    size_t cursor = 6;
    while (limit > p) {
        if (cursor + 5 > AMT_PACKET_SIZE || roomy[cursor] != 0xEE) {
            return nullptr;
        }
        if (roomy[cursor + 1] == id) {
            return roomy.data() + cursor + 3;
        }
        const uint32_t n = amt_get_u16_le(roomy.data() + cursor + 3);
        cursor += n + 5;
        p = static_cast<uint16_t>(p + n + 5);
    }
    return nullptr;
}

TEST_F(amt_packet_bounds, random_areas_are_searched_as_on_paper)
{
    std::mt19937 random(2);
    int found_count = 0;
    for (int round = 0; round < 20000; round++) {
        amt_packet_init(packet(), 1);
        uint32_t offset = 6;
        while (offset < AMT_PACKET_SIZE) {
            const bool is_wild = random() % 16 == 0;
            const uint16_t length = static_cast<uint16_t>(is_wild ? random() : random() % 700);
            put_atom_head(offset, static_cast<uint8_t>(random() % 24), length);
            offset += length + 5U;
        }
        if (random() % 4 == 0) {
            packet()[6 + random() % 200] = static_cast<uint8_t>(random());
        }
        amt_put_u16_le(packet() + 4, static_cast<uint16_t>(random() % 2 == 0 ? random() : random() % 5000));

        std::vector<uint8_t> roomy = m_area.content();
        roomy.resize(AMT_PACKET_SIZE + 70000);
        for (int id = 0; id < 24; id++) {
            const uint8_t *expected = find_on_paper(roomy, static_cast<uint8_t>(id));
            const uint8_t *found = amt_packet_find_atom(packet(), static_cast<uint8_t>(id));
            ASSERT_EQ(found == nullptr, expected == nullptr);
            if (found != nullptr) {
                ASSERT_EQ(found - packet(), expected - roomy.data());
                found_count++;
            }
        }
    }
    EXPECT_GT(found_count, 10000);
}

} // namespace
