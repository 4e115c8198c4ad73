#include "amt/amt-device/picture.h"

#include <string.h>
#include <zlib.h>

namespace {

/* The member has a gzip header and the largest window. */
constexpr int GZIP_WINDOW_BITS = 31;

/* The framebuffer's pages are laid out for 4 bytes a pixel. */
constexpr int64_t PAGE_PIXEL_SIZE = 4;

/* No screen is larger, and with this limit no product below leaves 64 bits. */
constexpr uint32_t SCREEN_SIDE_MAX = 0xFFFF;

constexpr int64_t ROW_SIZE = int64_t{AMT_PICTURE_WIDTH} * AMT_PIXEL_SIZE;

/* Byte offsets from the start of the memory. */
struct area_st
{
    int64_t m_page;       /* where the page begins */
    int64_t m_page_size;  /* what is cleared of it */
    int64_t m_first_row;  /* where the picture's first row goes */
    int64_t m_row_stride; /* from row to row */
};

area_st locate(const amt_picture_target_st &target)
{
    const int64_t width = target.m_width;
    const int64_t height = target.m_height;
    const int64_t left = (width - int64_t{AMT_PICTURE_WIDTH}) / 2;
    const int64_t top = (height - int64_t{AMT_PICTURE_HEIGHT}) / 2;
    area_st area = {};
    area.m_page = int64_t{target.m_y_offset} * width * PAGE_PIXEL_SIZE;
    area.m_page_size = width * height * AMT_PIXEL_SIZE;
    area.m_first_row = area.m_page + (left + top * width) * AMT_PIXEL_SIZE;
    area.m_row_stride = width * AMT_PIXEL_SIZE;
    return area;
}

bool is_inside(int64_t begin, int64_t size, uint32_t length)
{
    return begin >= 0 && begin + size <= int64_t{length};
}

} // namespace

int amt_picture_unpack(const uint8_t *member, uint32_t length, uint8_t *pixel)
{
    z_stream stream = {};
    if (inflateInit2(&stream, GZIP_WINDOW_BITS) != Z_OK) {
        return -1;
    }
    stream.next_in = const_cast<uint8_t *>(member);
    stream.avail_in = length;
    stream.next_out = pixel;
    stream.avail_out = AMT_PICTURE_SIZE;
    const int result = inflate(&stream, Z_PARTIAL_FLUSH);
    inflateEnd(&stream);
    const bool is_unpacked = (result == Z_OK || result == Z_STREAM_END) && stream.avail_out == 0;
    return is_unpacked ? 0 : -1;
}

bool amt_picture_fits(const amt_picture_target_st &target)
{
    if (target.m_width > SCREEN_SIDE_MAX || target.m_height > SCREEN_SIDE_MAX ||
        target.m_y_offset > SCREEN_SIDE_MAX)
    {
        return false;
    }
    const area_st area = locate(target);
    const int64_t picture_size = (AMT_PICTURE_HEIGHT - 1) * area.m_row_stride + ROW_SIZE;
    return is_inside(area.m_page, area.m_page_size, target.m_memory_length) &&
           is_inside(area.m_first_row, picture_size, target.m_memory_length);
}

void amt_picture_draw(const amt_picture_target_st &target, const uint8_t *pixel)
{
    const area_st area = locate(target);
    memset(target.m_memory_ptr + area.m_page, 0, static_cast<size_t>(area.m_page_size));
    uint8_t *row = target.m_memory_ptr + area.m_first_row;
    for (uint32_t i = 0; i < AMT_PICTURE_HEIGHT; i++) {
        memcpy(row, pixel, static_cast<size_t>(ROW_SIZE));
        row += area.m_row_stride;
        pixel += ROW_SIZE;
    }
}
