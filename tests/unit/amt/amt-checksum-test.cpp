#include "amt/amt-packet.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <random>
#include <stdio.h>
#include <stdlib.h>
#include <string>
#include <sys/mman.h>
#include <sys/resource.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "tests/unit/support/guarded-area.h"

namespace {

uint32_t checksum_of(const std::vector<uint8_t> &data)
{
    return amt_checksum(data.data(), static_cast<uint32_t>(data.size()));
}

/* The definition bit by bit, without a table. */
uint32_t slow_checksum(std::vector<uint8_t> data)
{
    data.resize(data.size() + 4);
    uint32_t crc = 0;
    for (const uint8_t byte : data) {
        uint32_t entry = crc >> 24;
        for (int bit = 0; bit < 8; bit++) {
            entry = (entry & 1) != 0 ? (entry >> 1) ^ 0xEDB88320U : entry >> 1;
        }
        crc = ((crc << 8) | byte) ^ entry;
    }
    return crc;
}

TEST(amt_checksum, known_values)
{
    EXPECT_EQ(amt_checksum(nullptr, 0), 0U);
    EXPECT_EQ(checksum_of({}), 0U);
    EXPECT_EQ(checksum_of({0x00}), 0U);
    EXPECT_EQ(checksum_of({0x01}), 0x77073096U);
    EXPECT_EQ(checksum_of({0xFF}), 0x2D02EF8DU);
    EXPECT_EQ(checksum_of({'1', '2', '3', '4', '5', '6', '7', '8', '9'}), 0xFC9E4DC1U);
    EXPECT_EQ(checksum_of({0xAA, 0xBB, 0xCC, 0xDD, 0x0E, 0, 0, 0, 0x02, 0, 0, 0, 0x06, 0, 0xBB, 0x0A, 0, 0}),
              0x02ABA4F9U);
    EXPECT_EQ(checksum_of(std::vector<uint8_t>(4092, 0xFF)), 0x208FF66EU);
    EXPECT_EQ(checksum_of(std::vector<uint8_t>(100000, 0xA5)), 0xDB588B43U);
}

TEST(amt_checksum, every_single_byte_shows_a_table_entry)
{
    for (int byte = 0; byte <= UINT8_MAX; byte++) {
        EXPECT_EQ(checksum_of({static_cast<uint8_t>(byte)}), slow_checksum({static_cast<uint8_t>(byte)}));
    }
}

TEST(amt_checksum, agrees_with_the_definition_at_every_length)
{
    std::mt19937 random(3);
    std::vector<uint8_t> data;
    for (uint32_t length = 0; length <= 4200; length++) {
        if (length < 64 || (length > 4080 && length < 4130) || length % 97 == 0) {
            const guarded_area_c area(data);
            ASSERT_EQ(amt_checksum(area.data(), length), slow_checksum(data)) << length;
        }
        data.push_back(static_cast<uint8_t>(random()));
    }
}

/* The table byte by byte: fast enough to try every length at every address. */
class byte_by_byte_c {
public:
    byte_by_byte_c()
    {
        for (uint32_t i = 0; i < m_entry_list.size(); i++) {
            m_entry_list[i] = slow_checksum({static_cast<uint8_t>(i)});
        }
    }

    uint32_t checksum_of(const uint8_t *data, uint32_t length) const
    {
        uint32_t crc = 0;
        for (uint32_t i = 0; i < length + 4; i++) {
            crc = ((crc << 8) | (i < length ? data[i] : 0U)) ^ m_entry_list[crc >> 24];
        }
        return crc;
    }

private:
    std::vector<uint32_t> m_entry_list = std::vector<uint32_t>(256);
};

std::vector<uint8_t> make_random(uint32_t seed, uint32_t size)
{
    std::mt19937 random(seed);
    std::vector<uint8_t> data(size);
    for (uint8_t &byte : data) {
        byte = static_cast<uint8_t>(random());
    }
    return data;
}

TEST(amt_checksum, agrees_with_byte_by_byte_at_every_length_and_address)
{
    constexpr uint32_t MOST = 200;
    constexpr uint32_t ADDRESSES = 17;
    const byte_by_byte_c reference;
    for (uint32_t seed = 0; seed < 5; seed++) {
        const std::vector<uint8_t> data = make_random(seed, MOST + ADDRESSES);
        for (uint32_t offset = 0; offset < ADDRESSES; offset++) {
            const uint8_t *const from = data.data() + offset;
            for (uint32_t length = 0; length <= MOST; length++) {
                ASSERT_EQ(amt_checksum(from, length), reference.checksum_of(from, length))
                    << "seed " << seed << ", offset " << offset << ", length " << length;
            }
        }
    }
}

TEST(amt_checksum, agrees_with_byte_by_byte_up_to_the_largest_frame)
{
    const byte_by_byte_c reference;
    const std::vector<uint8_t> data = make_random(11, 4200);
    for (uint32_t length = 0; length <= data.size(); length++) {
        ASSERT_EQ(amt_checksum(data.data(), length), reference.checksum_of(data.data(), length)) << length;
    }
}

/* It is linear and takes no notice of zeros in front: so both halves of a split data's checksum add up. */
TEST(amt_checksum, of_both_halves_adds_up_at_every_split)
{
    for (const uint32_t size : {1U, 7U, 8U, 9U, 64U, 257U, 1021U}) {
        const std::vector<uint8_t> whole = make_random(size, size);
        for (uint32_t split = 0; split <= size; split++) {
            std::vector<uint8_t> head = whole;
            std::fill(head.begin() + split, head.end(), uint8_t{0});
            const std::vector<uint8_t> tail(whole.begin() + split, whole.end());
            ASSERT_EQ(checksum_of(head) ^ checksum_of(tail), checksum_of(whole)) << size << " at " << split;
        }
    }
}

TEST(amt_checksum, absent_data_with_a_length_is_refused)
{
    EXPECT_EQ(amt_checksum(nullptr, 1), AMT_CHECKSUM_FAILED);
    EXPECT_EQ(amt_checksum(nullptr, 5000), AMT_CHECKSUM_FAILED);
}

TEST(amt_checksum, length_that_leaves_no_room_for_the_augmentation_is_refused)
{
    const guarded_area_c one(1);
    for (uint32_t length = 0xFFFFFFFCU; length != 0; length++) {
        EXPECT_EQ(amt_checksum(one.data(), length), 0xFFFFFFFFU) << length;
    }
}

#if !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__)
TEST(amt_checksum_death_test, needs_no_memory_whatever_the_length)
{
    ::testing::FLAGS_gtest_death_test_style = "threadsafe";
    const auto try_without_memory = [] {
        const uint32_t length = 16U << 20;
        void *data = mmap(nullptr, length, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
        const rlimit limit = {0, RLIM_INFINITY};
        if (data == MAP_FAILED || setrlimit(RLIMIT_AS, &limit) != 0) {
            _exit(1);
        }
        _exit(amt_checksum(static_cast<uint8_t *>(data), length) == 0 ? 0 : 2);
    };
    EXPECT_EXIT(try_without_memory(), ::testing::ExitedWithCode(0), "");
}
#endif

TEST(amt_checksum, threads_that_meet_in_it_agree)
{
    const std::vector<uint8_t> data(1000, 0x3C);
    const uint32_t expected = slow_checksum(data);
    std::vector<uint32_t> result_list(8);
    std::vector<std::thread> thread_list;
    for (uint32_t &result : result_list) {
        thread_list.emplace_back([&data, &result] { result = checksum_of(data); });
    }
    for (std::thread &thread : thread_list) {
        thread.join();
    }
    EXPECT_EQ(result_list, std::vector<uint32_t>(8, expected));
}

} // namespace
