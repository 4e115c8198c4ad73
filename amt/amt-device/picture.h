#pragma once

#include <stdint.h>

/* The form of the handshake picture: RGB565, little-endian, rows from top to bottom without padding. */
constexpr uint32_t AMT_PICTURE_WIDTH = 346;
constexpr uint32_t AMT_PICTURE_HEIGHT = 390;
constexpr uint32_t AMT_PIXEL_SIZE = 2;
constexpr uint32_t AMT_PICTURE_SIZE = AMT_PICTURE_WIDTH * AMT_PICTURE_HEIGHT * AMT_PIXEL_SIZE;

/*
 * Unpacks a gzip member (length bytes) of a picture into pixel, AMT_PICTURE_SIZE bytes. A member whose
 * trailer is missing is good as long as all pixels are there. Returns 0, or -1.
 */
int amt_picture_unpack(const uint8_t *member, uint32_t length, uint8_t *pixel);

/* Where a picture is drawn to: a screen's memory from its first byte, and the page in it. */
struct amt_picture_target_st
{
    uint8_t *m_memory_ptr;
    uint32_t m_memory_length; /* bytes */
    uint32_t m_width;         /* of the screen, in pixels */
    uint32_t m_height;
    uint32_t m_y_offset; /* first row of the page */
};

/*
 * Whether everything that amt_picture_draw writes lies inside the target's memory. The page begins 4 bytes a
 * pixel apart from the memory's start, though pixels are drawn at 2; a screen smaller than the picture is not
 * clipped, so that drawing would begin before the page and end behind it.
 */
bool amt_picture_fits(const amt_picture_target_st &target);

/* Clears the page to black and copies the picture (AMT_PICTURE_SIZE bytes) to its middle. Requires
 * amt_picture_fits. */
void amt_picture_draw(const amt_picture_target_st &target, const uint8_t *pixel);
