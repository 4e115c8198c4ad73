#include "amt/amt-byte-order.h"
#include "amt/amt-packet.h"

namespace {

constexpr uint32_t REFLECTED_POLYNOMIAL = 0xEDB88320U;

/* The zero bytes that flush the register behind the data. */
constexpr uint32_t AUGMENT_SIZE = 4;

/* As many bytes are taken at once. From this length on that is faster than one by one. */
constexpr uint32_t STRIDE = 8;

constexpr uint32_t REGISTER_SIZE = sizeof(uint32_t);
constexpr uint32_t BYTE_VALUES = 256;

/*
 * The register is linear: what a byte in it will have become is told apart from all others, and the table of
 * each distance tells it. Entry i of table 0 is what i in the register's highest byte has become when that
 * byte has left it; of table k, another k bytes later.
 */
struct table_st
{
    uint32_t m_entry_a[STRIDE][BYTE_VALUES];
};

constexpr table_st make_table()
{
    table_st table{};
    for (uint32_t i = 0; i < BYTE_VALUES; i++) {
        uint32_t c = i;
        for (int bit = 0; bit < 8; bit++) {
            c = (c & 1) != 0 ? (c >> 1) ^ REFLECTED_POLYNOMIAL : c >> 1;
        }
        table.m_entry_a[0][i] = c;
    }
    for (uint32_t k = 1; k < STRIDE; k++) {
        for (uint32_t i = 0; i < BYTE_VALUES; i++) {
            const uint32_t c = table.m_entry_a[k - 1][i];
            table.m_entry_a[k][i] = (c << 8) ^ table.m_entry_a[0][c >> 24];
        }
    }
    return table;
}

/* Made by the compiler, so that threads that meet in their first checksum share nothing that changes. */
constexpr table_st g_table = make_table();

uint32_t feed(uint32_t crc, uint8_t byte)
{
    return ((crc << 8) | byte) ^ g_table.m_entry_a[0][crc >> 24];
}

/* What the register becomes by DISTANCE zero bytes. */
template <uint32_t DISTANCE> uint32_t advance(uint32_t crc)
{
    constexpr uint32_t FIRST = DISTANCE - REGISTER_SIZE;
    return g_table.m_entry_a[FIRST][crc & 0xFF] ^ g_table.m_entry_a[FIRST + 1][crc >> 8 & 0xFF] ^
           g_table.m_entry_a[FIRST + 2][crc >> 16 & 0xFF] ^ g_table.m_entry_a[FIRST + 3][crc >> 24];
}

/* As STRIDE times feed. The eight look-ups do not wait for one another. */
uint32_t feed_stride(uint32_t crc, const uint8_t *data)
{
    return advance<STRIDE>(crc) ^ advance<REGISTER_SIZE>(amt_get_u32_be(data)) ^
           amt_get_u32_be(data + REGISTER_SIZE);
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
    for (; length >= STRIDE; length -= STRIDE) {
        crc = feed_stride(crc, data);
        data += STRIDE;
    }
    for (uint32_t i = 0; i < length; i++) {
        crc = feed(crc, data[i]);
    }
    return advance<AUGMENT_SIZE>(crc);
}
