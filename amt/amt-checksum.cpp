#include "amt/amt-packet.h"

namespace {

constexpr uint32_t REFLECTED_POLYNOMIAL = 0xEDB88320U;

/* The zero bytes that flush the register behind the data. */
constexpr uint32_t AUGMENT_SIZE = 4;

struct table_st
{
    uint32_t m_entry_a[256];
};

constexpr table_st make_table()
{
    table_st table{};
    for (uint32_t i = 0; i < 256; i++) {
        uint32_t c = i;
        for (int bit = 0; bit < 8; bit++) {
            c = (c & 1) != 0 ? (c >> 1) ^ REFLECTED_POLYNOMIAL : c >> 1;
        }
        table.m_entry_a[i] = c;
    }
    return table;
}

/* Made by the compiler, so that threads that meet in their first checksum share nothing that changes. */
constexpr table_st g_table = make_table();

uint32_t feed(uint32_t crc, uint8_t byte)
{
    return ((crc << 8) | byte) ^ g_table.m_entry_a[crc >> 24];
}

} // namespace

uint32_t amt_checksum(const uint8_t *data, uint32_t length)
{
    if (length == 0) {
        return 0;
    }
    if (data == nullptr || length > UINT32_MAX - AUGMENT_SIZE) {
        return AMT_CHECKSUM_FAILED;
    }
    uint32_t crc = 0;
    for (uint32_t i = 0; i < length; i++) {
        crc = feed(crc, data[i]);
    }
    for (uint32_t i = 0; i < AUGMENT_SIZE; i++) {
        crc = feed(crc, 0);
    }
    return crc;
}
