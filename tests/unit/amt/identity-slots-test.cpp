#include "amt/amt-handle/channel/identity-slots.h"

#include <gtest/gtest.h>
#include <string.h>
#include <string>
#include <thread>

namespace {

std::string get_text(int kind)
{
    char text_a[AMT_IDENTITY_TEXT_SIZE];
    memset(text_a, 'x', sizeof(text_a));
    amt_identity_get_text(kind, text_a);
    return std::string(text_a, strnlen(text_a, sizeof(text_a)));
}

class identity_slots : public testing::Test {
protected:
    void SetUp() override
    {
        amt_identity_reset();
    }
};

TEST_F(identity_slots, start_empty)
{
    EXPECT_EQ(get_text(AMT_IDENTITY_IMEI), "");
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "");
    EXPECT_EQ(amt_identity_get_channel(), 0);
    EXPECT_EQ(amt_identity_get_pending(), AMT_IDENTITY_NONE);
}

TEST_F(identity_slots, keep_each_text_by_itself)
{
    amt_identity_set_text(AMT_IDENTITY_IMEI, "350000000000001", 15);
    amt_identity_set_text(AMT_IDENTITY_SN, "SN1", 3);
    EXPECT_EQ(get_text(AMT_IDENTITY_IMEI), "350000000000001");
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "SN1");
}

TEST_F(identity_slots, cut_a_text_at_20_characters)
{
    const char *const text = "123456789012345678901";
    amt_identity_set_text(AMT_IDENTITY_SN, text, 20);
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "12345678901234567890");
    amt_identity_set_text(AMT_IDENTITY_SN, text, 21);
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "12345678901234567890");
}

TEST_F(identity_slots, a_shorter_text_replaces_the_longer_one)
{
    amt_identity_set_text(AMT_IDENTITY_SN, "12345678", 8);
    amt_identity_set_text(AMT_IDENTITY_SN, "ABCDEF", 2);
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "AB");
    amt_identity_set_text(AMT_IDENTITY_SN, "A\0B", 3);
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "A");
    amt_identity_set_text(AMT_IDENTITY_SN, nullptr, 3);
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "");
}

TEST_F(identity_slots, other_kinds_have_no_text)
{
    amt_identity_set_text(3, "A", 1);
    EXPECT_EQ(get_text(3), "");
    EXPECT_EQ(get_text(AMT_IDENTITY_NONE), "");
    EXPECT_EQ(get_text(AMT_IDENTITY_IMEI), "");
    EXPECT_EQ(get_text(AMT_IDENTITY_SN), "");
}

TEST_F(identity_slots, reset_forgets_everything)
{
    amt_identity_set_text(AMT_IDENTITY_IMEI, "1", 1);
    amt_identity_set_channel(1);
    amt_identity_set_pending(AMT_IDENTITY_IMEI);
    EXPECT_EQ(amt_identity_get_channel(), 1);
    EXPECT_EQ(amt_identity_get_pending(), AMT_IDENTITY_IMEI);
    amt_identity_reset();
    EXPECT_EQ(get_text(AMT_IDENTITY_IMEI), "");
    EXPECT_EQ(amt_identity_get_channel(), 0);
    EXPECT_EQ(amt_identity_get_pending(), AMT_IDENTITY_NONE);
}

TEST_F(identity_slots, a_reader_never_sees_half_a_text)
{
    const std::string all_a(20, 'A');
    const std::string all_b(20, 'B');
    amt_identity_set_text(AMT_IDENTITY_IMEI, all_a.c_str(), 20);
    std::thread writer([&] {
        for (int i = 0; i < 20000; i++) {
            amt_identity_set_text(AMT_IDENTITY_IMEI, (i % 2 == 0 ? all_b : all_a).c_str(), 20);
            amt_identity_set_channel(static_cast<uint8_t>(i));
            amt_identity_set_pending(i % 3);
        }
    });
    for (int i = 0; i < 20000; i++) {
        const std::string text = get_text(AMT_IDENTITY_IMEI);
        ASSERT_TRUE(text == all_a || text == all_b) << text;
        amt_identity_get_channel();
        amt_identity_get_pending();
    }
    writer.join();
}

} // namespace
