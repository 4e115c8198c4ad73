#include "amt/amt-device/radio-address.h"

#include <string.h>
#include <string>

#include <gtest/gtest.h>

#include "tests/unit/amt/modem-line.h"

namespace {

constexpr uint8_t ATOM = 111;
constexpr uint32_t CAPACITY = AMT_RADIO_ADDRESS_SIZE;

struct taken_st
{
    uint32_t m_count;
    std::string m_text;
};

/* Takes the text into the middle of an area whose edges must stay. */
taken_st take(const std::string &atoms)
{
    amt_buf_st req = {};
    const std::string packet = wire_packet(172, atoms);
    packet.copy(reinterpret_cast<char *>(req.m_buf_a), AMT_PACKET_SIZE);
    char area_a[CAPACITY + 2];
    memset(area_a, '#', sizeof(area_a));
    const uint32_t count = amt_radio_address_get(&req, ATOM, area_a + 1);
    EXPECT_EQ(area_a[0], '#');
    EXPECT_EQ(area_a[CAPACITY + 1], '#');
    return {count, area_a + 1};
}

TEST(radio_address, a_missing_or_empty_atom_is_an_empty_text)
{
    EXPECT_EQ(take("").m_count, 0U);
    EXPECT_EQ(take("").m_text, "");
    EXPECT_EQ(take(text_atom(ATOM, "")).m_count, 0U);
    EXPECT_EQ(take(text_atom(ATOM, "")).m_text, "");
}

TEST(radio_address, takes_at_most_one_less_than_the_capacity)
{
    for (const uint32_t length : {1U, 17U, 58U, 59U, 60U, 61U, 200U}) {
        const uint32_t expected = length < CAPACITY ? length : CAPACITY - 1;
        const taken_st taken = take(text_atom(ATOM, std::string(length, 'a')));
        EXPECT_EQ(taken.m_count, expected) << length;
        EXPECT_EQ(taken.m_text, std::string(expected, 'a')) << length;
    }
}

TEST(radio_address, counts_what_follows_a_zero_byte)
{
    const taken_st taken = take(text_atom(ATOM, std::string("12\0"
                                                            "34",
                                                            5)));
    EXPECT_EQ(taken.m_count, 5U);
    EXPECT_EQ(taken.m_text, "12");
}

} // namespace
