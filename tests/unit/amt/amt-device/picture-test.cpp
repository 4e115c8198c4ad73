#include "amt/amt-device/picture.h"

#include <set>
#include <string.h>
#include <vector>
#include <zlib.h>

#include <gtest/gtest.h>

#include "amt/amt-device/embed/embedded-data.h"

namespace {

using bytes = std::vector<uint8_t>;

constexpr uint8_t GUARD = 0xA5;

/* Every pixel differs from its neighbours and none is black. */
bytes test_picture()
{
    bytes pixel(AMT_PICTURE_SIZE);
    for (uint32_t i = 0; i < AMT_PICTURE_SIZE; i++) {
        pixel[i] = static_cast<uint8_t>(i % 251 + 1);
    }
    return pixel;
}

/* A member in gzip's frame, or in another that inflate knows. */
bytes gzip(const bytes &content, int window_bits = 31)
{
    bytes member(content.size() + 1024);
    z_stream stream = {};
    deflateInit2(&stream, 9, Z_DEFLATED, window_bits, 8, Z_DEFAULT_STRATEGY);
    stream.next_in = const_cast<uint8_t *>(content.data());
    stream.avail_in = static_cast<uInt>(content.size());
    stream.next_out = member.data();
    stream.avail_out = static_cast<uInt>(member.size());
    EXPECT_EQ(deflate(&stream, Z_FINISH), Z_STREAM_END);
    member.resize(stream.total_out);
    deflateEnd(&stream);
    return member;
}

int unpack(const bytes &member, bytes *pixel)
{
    pixel->assign(AMT_PICTURE_SIZE, GUARD);
    return amt_picture_unpack(member.data(), static_cast<uint32_t>(member.size()), pixel->data());
}

uint16_t stored_pixel(const bytes &pixel, uint32_t x, uint32_t y)
{
    const size_t offset = (size_t{y} * AMT_PICTURE_WIDTH + x) * 2;
    return static_cast<uint16_t>(pixel[offset] | pixel[offset + 1] << 8);
}

TEST(picture, the_stored_member_holds_a_mostly_black_picture)
{
    bytes pixel(AMT_PICTURE_SIZE, GUARD);
    ASSERT_EQ(amt_picture_unpack(g_handshake_picture_a, g_handshake_picture_length, pixel.data()), 0);
    uint32_t black = 0;
    uint32_t white = 0;
    std::set<uint16_t> colours;
    for (uint32_t y = 0; y < AMT_PICTURE_HEIGHT; y++) {
        for (uint32_t x = 0; x < AMT_PICTURE_WIDTH; x++) {
            const uint16_t value = stored_pixel(pixel, x, y);
            black += value == 0x0000 ? 1 : 0;
            white += value == 0xFFFF ? 1 : 0;
            colours.insert(value);
        }
    }
    EXPECT_GT(black, AMT_PICTURE_WIDTH * AMT_PICTURE_HEIGHT / 2);
    EXPECT_GT(white, 5000U);
    EXPECT_GT(colours.size(), 3U);
}

/* Byte order and channel order: the pulse is green, the stripes are amber. */
TEST(picture, the_stored_colours_are_little_endian_rgb565)
{
    bytes pixel(AMT_PICTURE_SIZE);
    ASSERT_EQ(amt_picture_unpack(g_handshake_picture_a, g_handshake_picture_length, pixel.data()), 0);
    const uint16_t pulse = stored_pixel(pixel, 60, 154);
    EXPECT_GT(pulse >> 5 & 0x3F, 50);
    EXPECT_LT(pulse >> 11, 8);
    const uint16_t stripe = stored_pixel(pixel, 5, 12);
    EXPECT_GT(stripe >> 11, 28);
    EXPECT_GT(stripe >> 5 & 0x3F, 40);
    EXPECT_EQ(stripe & 0x1F, 0);
}

TEST(picture, unpacks_a_complete_member)
{
    const bytes expected = test_picture();
    bytes pixel;
    EXPECT_EQ(unpack(gzip(expected), &pixel), 0);
    EXPECT_EQ(pixel, expected);
}

TEST(picture, unpacks_a_member_whose_trailer_is_cut)
{
    const bytes expected = test_picture();
    const bytes member = gzip(expected);
    for (size_t missing = 1; missing <= 8; missing++) {
        bytes pixel;
        EXPECT_EQ(unpack(bytes(member.begin(), member.end() - static_cast<long>(missing)), &pixel), 0)
            << missing;
        EXPECT_EQ(pixel, expected) << missing;
    }
}

TEST(picture, refuses_what_is_no_whole_picture)
{
    const bytes member = gzip(test_picture());
    bytes pixel;
    EXPECT_EQ(unpack(bytes(member.begin(), member.begin() + static_cast<long>(member.size() / 2)), &pixel),
              -1);
    EXPECT_EQ(unpack(gzip(bytes(AMT_PICTURE_SIZE - 1, 7)), &pixel), -1);
    EXPECT_EQ(unpack(bytes(member.begin(), member.begin() + 10), &pixel), -1);
    EXPECT_EQ(unpack(bytes{0}, &pixel), -1);
    EXPECT_EQ(unpack(gzip(test_picture(), 15), &pixel), -1);
    bytes broken_header = member;
    broken_header[0] = 0;
    EXPECT_EQ(unpack(broken_header, &pixel), -1);
    bytes broken_checksum = member;
    broken_checksum[member.size() - 6] ^= 1;
    EXPECT_EQ(unpack(broken_checksum, &pixel), -1);
}

/* A screen in memory, of exactly the given length, with guards behind it. */
struct screen_st
{
    bytes m_area;
    amt_picture_target_st m_target;

    screen_st(uint32_t width, uint32_t height, uint32_t y_offset, uint32_t length)
        : m_area(length, GUARD), m_target{m_area.data(), length, width, height, y_offset}
    {
    }

    uint16_t pixel(size_t page, uint32_t x, uint32_t y) const
    {
        const size_t offset = page + (size_t{y} * m_target.m_width + x) * 2;
        return static_cast<uint16_t>(m_area[offset] | m_area[offset + 1] << 8);
    }
};

/* How many pixels of the page at this byte are not what a centred picture on black is. */
uint32_t count_wrong_pixels(const screen_st &screen, size_t page, const bytes &picture)
{
    const uint32_t left = (screen.m_target.m_width - AMT_PICTURE_WIDTH) / 2;
    const uint32_t top = (screen.m_target.m_height - AMT_PICTURE_HEIGHT) / 2;
    uint32_t wrong = 0;
    for (uint32_t y = 0; y < screen.m_target.m_height; y++) {
        for (uint32_t x = 0; x < screen.m_target.m_width; x++) {
            const bool is_picture =
                x >= left && x < left + AMT_PICTURE_WIDTH && y >= top && y < top + AMT_PICTURE_HEIGHT;
            const uint16_t expected = is_picture ? stored_pixel(picture, x - left, y - top) : 0;
            wrong += screen.pixel(page, x, y) == expected ? 0U : 1U;
        }
    }
    return wrong;
}

size_t count_guards(const screen_st &screen, size_t begin, size_t end)
{
    size_t count = 0;
    for (size_t i = begin; i < end; i++) {
        count += screen.m_area[i] == GUARD ? 1U : 0U;
    }
    return count;
}

void expect_centred(uint32_t width, uint32_t height)
{
    const uint32_t page_size = width * height * 2;
    screen_st screen(width, height, 0, page_size + 64);
    const bytes picture = test_picture();
    ASSERT_TRUE(amt_picture_fits(screen.m_target));
    amt_picture_draw(screen.m_target, picture.data());
    EXPECT_EQ(count_wrong_pixels(screen, 0, picture), 0U) << width << " x " << height;
    EXPECT_EQ(count_guards(screen, page_size, page_size + 64), 64U);
}

TEST(picture, fills_a_screen_of_its_own_size)
{
    expect_centred(AMT_PICTURE_WIDTH, AMT_PICTURE_HEIGHT);
}

TEST(picture, is_centred_on_a_larger_screen)
{
    expect_centred(480, 800);
    expect_centred(AMT_PICTURE_WIDTH + 1, AMT_PICTURE_HEIGHT);
    expect_centred(AMT_PICTURE_WIDTH + 3, AMT_PICTURE_HEIGHT + 5);
    expect_centred(AMT_PICTURE_WIDTH, 1000);
}

/* The second page begins 4 bytes a pixel behind the first, and nothing before it is touched. */
TEST(picture, the_page_step_is_four_bytes_a_pixel)
{
    constexpr uint32_t width = 480;
    constexpr uint32_t height = 400;
    constexpr uint32_t page = width * height * 4;
    screen_st screen(width, height, height, page + width * height * 2);
    const bytes picture = test_picture();
    ASSERT_TRUE(amt_picture_fits(screen.m_target));
    amt_picture_draw(screen.m_target, picture.data());
    EXPECT_EQ(count_guards(screen, 0, page), page);
    EXPECT_EQ(count_wrong_pixels(screen, page, picture), 0U);
}

TEST(picture, fits_to_the_last_byte_only)
{
    for (const uint32_t y_offset : {0U, 800U}) {
        const uint32_t needed = 480 * y_offset * 4 + 480 * 800 * 2;
        screen_st exact(480, 800, y_offset, needed);
        EXPECT_TRUE(amt_picture_fits(exact.m_target));
        screen_st short_by_one(480, 800, y_offset, needed - 1);
        EXPECT_FALSE(amt_picture_fits(short_by_one.m_target));
    }
}

TEST(picture, a_smaller_screen_would_be_written_outside)
{
    constexpr uint32_t plenty = 4 * 1024 * 1024;
    EXPECT_FALSE(amt_picture_fits(screen_st(340, 380, 0, plenty).m_target));
    EXPECT_FALSE(amt_picture_fits(screen_st(480, 380, 0, plenty).m_target));
    EXPECT_FALSE(amt_picture_fits(screen_st(0, 0, 0, plenty).m_target));
    EXPECT_FALSE(amt_picture_fits(screen_st(480, 0, 0, plenty).m_target));
}

/* On a screen that is narrower by two pixels the last row ends a pixel behind it, where the memory may end, too. */
TEST(picture, a_narrower_screen_would_be_written_behind_its_end)
{
    constexpr uint32_t width = AMT_PICTURE_WIDTH - 2;
    constexpr uint32_t length = width * 4 + width * AMT_PICTURE_HEIGHT * 2;
    EXPECT_FALSE(amt_picture_fits(screen_st(width, AMT_PICTURE_HEIGHT, 1, length).m_target));
    EXPECT_FALSE(amt_picture_fits(screen_st(width, AMT_PICTURE_HEIGHT, 1, length + 1).m_target));
    EXPECT_TRUE(amt_picture_fits(screen_st(width, AMT_PICTURE_HEIGHT, 1, length + 2).m_target));
}

/* Without clipping the picture begins before a smaller screen's second page; there is memory there to take
 * it. */
TEST(picture, a_smaller_screen_overlaps_its_second_page)
{
    constexpr uint32_t width = 480;
    constexpr uint32_t height = 380;
    constexpr uint32_t page = width * height * 4;
    constexpr uint32_t first = page + ((width - AMT_PICTURE_WIDTH) / 2 - 5 * width) * 2;
    screen_st screen(width, height, height, page + width * (height + 5) * 2);
    const bytes picture = test_picture();
    ASSERT_TRUE(amt_picture_fits(screen.m_target));
    amt_picture_draw(screen.m_target, picture.data());
    EXPECT_EQ(count_guards(screen, 0, first), first);
    EXPECT_EQ(memcmp(screen.m_area.data() + first, picture.data(), AMT_PICTURE_WIDTH * 2), 0);
}

TEST(picture, has_a_largest_screen)
{
    constexpr uint32_t side_max = 0xFFFF;
    const amt_picture_target_st wide = {nullptr, 0xFFFFFFFFU, side_max, AMT_PICTURE_HEIGHT, 0};
    const amt_picture_target_st high = {nullptr, 0xFFFFFFFFU, AMT_PICTURE_WIDTH, side_max, 0};
    const amt_picture_target_st low = {nullptr, 0xFFFFFFFFU, AMT_PICTURE_WIDTH, AMT_PICTURE_HEIGHT, side_max};
    for (amt_picture_target_st target : {wide, high, low}) {
        EXPECT_TRUE(amt_picture_fits(target));
        target.m_width += target.m_width == side_max ? 1 : 0;
        target.m_height += target.m_height == side_max ? 1 : 0;
        target.m_y_offset += target.m_y_offset == side_max ? 1 : 0;
        EXPECT_FALSE(amt_picture_fits(target));
    }
}

TEST(picture, sizes_that_overflow_are_refused)
{
    const uint32_t side_list[] = {0x10000U, 0x7FFFFFFFU, 0x80000000U, 0xFFFFFFFFU};
    for (const uint32_t side : side_list) {
        EXPECT_FALSE(amt_picture_fits({nullptr, 0xFFFFFFFFU, side, 800, 0}));
        EXPECT_FALSE(amt_picture_fits({nullptr, 0xFFFFFFFFU, 480, side, 0}));
        EXPECT_FALSE(amt_picture_fits({nullptr, 0xFFFFFFFFU, 480, 800, side}));
        EXPECT_FALSE(amt_picture_fits({nullptr, 0xFFFFFFFFU, side, side, side}));
    }
    EXPECT_FALSE(amt_picture_fits({nullptr, 0xFFFFFFFFU, 0xFFFF, 0xFFFF, 0xFFFF}));
}

} // namespace
