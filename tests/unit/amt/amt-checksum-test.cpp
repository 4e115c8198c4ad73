#include "amt/amt-packet.h"

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
