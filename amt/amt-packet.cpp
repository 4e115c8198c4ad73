#include "amt/amt-packet.h"

#include <stdlib.h>
#include <string.h>

#include "amt/amt-byte-order.h"

namespace {

/* Distance from an atom's length field to its value. */
constexpr uint32_t LENGTH_FIELD_SIZE = AMT_ATOM_HEADER_SIZE - AMT_ATOM_LENGTH_OFFSET;

void put_length(uint8_t *packet, uint16_t total)
{
    amt_put_u16_le(packet, total);
    amt_put_u16_le(packet + AMT_PACKET_ATOM_LENGTH_OFFSET,
                   static_cast<uint16_t>(total - AMT_PACKET_HEADER_SIZE));
}

bool fits(uint32_t total, size_t n)
{
    return n <= AMT_PACKET_SIZE && total + AMT_ATOM_HEADER_SIZE + n <= AMT_PACKET_SIZE;
}

/* Inlined where the size is known, the copy is a store. */
inline void append_atom(uint8_t *packet, uint8_t atom_id, uint8_t type, const void *value, size_t n)
{
    const uint16_t total = amt_packet_get_length(packet);
    if (packet == nullptr || !fits(total, n)) {
        return;
    }
    uint8_t *const atom = packet + total;
    atom[0] = AMT_ATOM_HEAD;
    atom[AMT_ATOM_ID_OFFSET] = atom_id;
    atom[AMT_ATOM_TYPE_OFFSET] = type;
    amt_put_u16_le(atom + AMT_ATOM_LENGTH_OFFSET, static_cast<uint16_t>(n));
    memcpy(atom + AMT_ATOM_HEADER_SIZE, value, n);
    put_length(packet, static_cast<uint16_t>(total + AMT_ATOM_HEADER_SIZE + n));
}

/* How much of the area lies behind a length field, its own bytes left out. */
uint32_t get_room_behind(const uint8_t *packet, const uint8_t *length_field)
{
    return AMT_PACKET_SIZE - static_cast<uint32_t>(length_field + LENGTH_FIELD_SIZE - packet);
}

/* Copies the first n bytes of the value behind a length field; those behind the end of the area count as zero
 * bytes. */
void copy_value(uint8_t *dst, const uint8_t *packet, const uint8_t *length_field, uint32_t n)
{
    const uint8_t *value = length_field + LENGTH_FIELD_SIZE;
    const uint32_t inside = get_room_behind(packet, length_field);
    const uint32_t copied = n < inside ? n : inside;
    memcpy(dst, value, copied);
    if (copied < n) {
        memset(dst + copied, 0, n - copied);
    }
}

int32_t get_number(const uint8_t *packet, uint8_t atom_id, int32_t missing)
{
    const uint8_t *length_field = amt_packet_find_atom(packet, atom_id);
    if (length_field == nullptr) {
        return missing;
    }
    const uint32_t n = amt_get_u16_le(length_field);
    if (n == AMT_ATOM_INT_SIZE && n <= get_room_behind(packet, length_field)) {
        return static_cast<int32_t>(amt_get_u32_le(length_field + LENGTH_FIELD_SIZE));
    }
    uint8_t number_a[AMT_ATOM_INT_SIZE];
    if (n > sizeof(number_a)) { /* GCOVR_EXCL_BR_LINE */
        abort();                /* GCOVR_EXCL_LINE: who aborts writes no counts; a death test sees it */
    }
    amt_put_u32_le(number_a, static_cast<uint32_t>(missing));
    copy_value(number_a, packet, length_field, n);
    return static_cast<int32_t>(amt_get_u32_le(number_a));
}

} // namespace

void amt_packet_clear(void *buf, uint32_t size)
{
    if (buf != nullptr) {
        memset(buf, 0, size);
    }
}

uint16_t amt_packet_init(uint8_t *packet, uint8_t cmd)
{
    if (packet == nullptr) {
        return 0;
    }
    amt_packet_clear(packet, AMT_PACKET_SIZE);
    packet[AMT_PACKET_HEAD_OFFSET] = AMT_PACKET_HEAD;
    packet[AMT_PACKET_CMD_OFFSET] = cmd;
    return amt_packet_add_length(packet, AMT_PACKET_HEADER_SIZE);
}

uint8_t amt_packet_get_cmd(const uint8_t *packet)
{
    return packet == nullptr ? 0 : packet[AMT_PACKET_CMD_OFFSET];
}

uint16_t amt_packet_get_length(const uint8_t *packet)
{
    return packet == nullptr ? 0 : amt_get_u16_le(packet);
}

uint8_t *amt_packet_get_end(uint8_t *packet)
{
    return packet == nullptr ? nullptr : packet + amt_packet_get_length(packet);
}

uint16_t amt_packet_add_length(uint8_t *packet, uint16_t n)
{
    if (packet == nullptr) {
        return 0;
    }
    put_length(packet, static_cast<uint16_t>(amt_packet_get_length(packet) + n));
    return amt_get_u16_le(packet + AMT_PACKET_ATOM_LENGTH_OFFSET);
}

bool amt_packet_has_room(const uint8_t *packet, uint32_t n)
{
    return packet != nullptr && fits(amt_packet_get_length(packet), n);
}

void amt_packet_add_int(uint8_t *packet, uint8_t atom_id, int32_t value)
{
    uint8_t value_a[AMT_ATOM_INT_SIZE];
    amt_put_u32_le(value_a, static_cast<uint32_t>(value));
    append_atom(packet, atom_id, AMT_ATOM_TYPE_INT, value_a, sizeof(value_a));
}

void amt_packet_add_bool(uint8_t *packet, uint8_t atom_id, int32_t value)
{
    const uint8_t low_byte = static_cast<uint8_t>(value);
    append_atom(packet, atom_id, AMT_ATOM_TYPE_BOOL, &low_byte, AMT_ATOM_BOOL_SIZE);
}

void amt_packet_add_string(uint8_t *packet, uint8_t atom_id, const char *text)
{
    if (text != nullptr) {
        append_atom(packet, atom_id, AMT_ATOM_TYPE_STRING, text, strlen(text));
    }
}

void amt_packet_add_bytes(uint8_t *packet, uint8_t atom_id, const uint8_t *data, uint16_t n)
{
    if (data != nullptr) {
        append_atom(packet, atom_id, AMT_ATOM_TYPE_BYTES, data, n);
    }
}

const uint8_t *amt_packet_find_atom(const uint8_t *packet, uint8_t atom_id)
{
    if (packet == nullptr) {
        return nullptr;
    }
    const uint32_t limit = amt_get_u16_le(packet + AMT_PACKET_ATOM_LENGTH_OFFSET);
    /*
     * The position counts 16 bits and the offset does not, but they never part: a position that wraps has
     * taken the offset out of the area, which ends the search.
     */
    uint16_t position = 0;
    uint32_t offset = AMT_PACKET_HEADER_SIZE;
    while (limit > position && offset + AMT_ATOM_HEADER_SIZE <= AMT_PACKET_SIZE) {
        const uint8_t *atom = packet + offset;
        if (atom[0] != AMT_ATOM_HEAD) {
            return nullptr;
        }
        if (atom[AMT_ATOM_ID_OFFSET] == atom_id) {
            return atom + AMT_ATOM_LENGTH_OFFSET;
        }
        const uint32_t atom_size = AMT_ATOM_HEADER_SIZE + amt_get_u16_le(atom + AMT_ATOM_LENGTH_OFFSET);
        offset += atom_size;
        position = static_cast<uint16_t>(position + atom_size);
    }
    return nullptr;
}

int32_t amt_packet_get_int(const uint8_t *packet, uint8_t atom_id)
{
    return get_number(packet, atom_id, 0);
}

int32_t amt_packet_get_bool(const uint8_t *packet, uint8_t atom_id)
{
    return get_number(packet, atom_id, 1);
}

uint32_t amt_packet_get_bytes(const uint8_t *packet, uint8_t atom_id, uint8_t *dst, uint32_t capacity)
{
    const uint8_t *length_field = amt_packet_find_atom(packet, atom_id);
    if (length_field == nullptr) {
        return 0;
    }
    const uint32_t n = amt_get_u16_le(length_field);
    if (capacity == 0) {
        return n;
    }
    if (dst == nullptr) {
        return 0;
    }
    const uint32_t count = n < capacity ? n : capacity;
    amt_packet_clear(dst, capacity);
    copy_value(dst, packet, length_field, count);
    return count;
}

uint32_t amt_packet_get_string(const uint8_t *packet, uint8_t atom_id, char *dst, uint32_t capacity)
{
    const uint8_t *length_field = amt_packet_find_atom(packet, atom_id);
    if (length_field == nullptr) {
        return 0;
    }
    const uint32_t n = amt_get_u16_le(length_field);
    if (capacity == 0) {
        return n + 1;
    }
    if (dst == nullptr) {
        return 0;
    }
    const uint32_t count = capacity < n ? capacity - 1 : n;
    amt_packet_clear(dst, capacity);
    copy_value(reinterpret_cast<uint8_t *>(dst), packet, length_field, count);
    return count;
}
