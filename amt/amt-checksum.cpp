#include "amt/amt-packet.h"

#include <stdlib.h>
#include <string.h>

namespace {

constexpr uint32_t REFLECTED_POLYNOMIAL = 0xEDB88320U;

/* The zero bytes that flush the register behind the data. */
constexpr uint32_t AUGMENT_SIZE = 4;

/* Data up to this size is worked on without the heap: every frame of the PC link fits. */
constexpr uint32_t FIXED_SIZE = AMT_PACKET_SIZE + AMT_ENVELOPE_OVERHEAD;

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

uint32_t run_register(const uint8_t *augmented, uint32_t length)
{
    uint32_t crc = 0;
    for (uint32_t i = 0; i < length; i++) {
        crc = ((crc << 8) | augmented[i]) ^ g_table.m_entry_a[crc >> 24];
    }
    return crc;
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
    const uint32_t augmented_length = length + AUGMENT_SIZE;
    uint8_t fixed_a[FIXED_SIZE];
    uint8_t *scratch = fixed_a;
    if (augmented_length > sizeof(fixed_a)) {
        scratch = static_cast<uint8_t *>(malloc(augmented_length));
        if (scratch == nullptr) {
            return AMT_CHECKSUM_FAILED;
        }
    }
    memcpy(scratch, data, length);
    memset(scratch + length, 0, AUGMENT_SIZE);
    const uint32_t crc = run_register(scratch, augmented_length);
    if (scratch != fixed_a) {
        free(scratch);
    }
    return crc;
}
