#pragma once

#include <stdint.h>

/*
 * Numbers on the wire, read and written a byte at a time: they stand at odd addresses. Requires 2 or 4 bytes
 * at the given place.
 */

inline uint16_t amt_get_u16_le(const uint8_t *from)
{
    return static_cast<uint16_t>(from[0] | from[1] << 8);
}

inline uint32_t amt_get_u32_le(const uint8_t *from)
{
    return static_cast<uint32_t>(amt_get_u16_le(from)) | static_cast<uint32_t>(amt_get_u16_le(from + 2))
                                                             << 16;
}

inline uint32_t amt_get_u32_be(const uint8_t *from)
{
    return static_cast<uint32_t>(from[0]) << 24 | static_cast<uint32_t>(from[1]) << 16 |
           static_cast<uint32_t>(from[2]) << 8 | static_cast<uint32_t>(from[3]);
}

inline void amt_put_u16_le(uint8_t *to, uint16_t value)
{
    to[0] = static_cast<uint8_t>(value);
    to[1] = static_cast<uint8_t>(value >> 8);
}

inline void amt_put_u32_le(uint8_t *to, uint32_t value)
{
    amt_put_u16_le(to, static_cast<uint16_t>(value));
    amt_put_u16_le(to + 2, static_cast<uint16_t>(value >> 16));
}
