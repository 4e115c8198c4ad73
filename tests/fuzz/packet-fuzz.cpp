#include "amt/amt-packet.h"

#include <algorithm>
#include <string>

#include "amt/amt-byte-order.h"
#include "tests/fuzz/support/input.h"

/*
 * The first 4 bytes choose an atom id, a capacity and a value; the rest is the start of the packet's area.
 * The getters read it, then the adders write to it.
 */
namespace {

constexpr uint32_t LENGTH_FIELD_SIZE = 2;

void read_atom(const std::vector<uint8_t> &area, uint8_t id, uint32_t capacity)
{
    const uint8_t *packet = area.data();
    const uint8_t *found = amt_packet_find_atom(packet, id);
    std::vector<uint8_t> dst(std::max(capacity, 1U), 0x77);
    dst.shrink_to_fit();
    char *text = reinterpret_cast<char *>(dst.data());
    if (found == nullptr) {
        FUZZ_REQUIRE(amt_packet_get_int(packet, id) == 0);
        FUZZ_REQUIRE(amt_packet_get_bool(packet, id) == 1);
        FUZZ_REQUIRE(amt_packet_get_bytes(packet, id, dst.data(), capacity) == 0);
        FUZZ_REQUIRE(amt_packet_get_string(packet, id, text, capacity) == 0);
        return;
    }
    FUZZ_REQUIRE(found >= packet + AMT_PACKET_HEADER_SIZE);
    FUZZ_REQUIRE(found + LENGTH_FIELD_SIZE <= packet + AMT_PACKET_SIZE);
    const uint32_t n = amt_get_u16_le(found);
    if (n <= AMT_ATOM_INT_SIZE) { /* a longer number ends the process */
        const int32_t number = amt_packet_get_int(packet, id);
        FUZZ_REQUIRE(n == 0 || amt_packet_get_bool(packet, id) == number);
        FUZZ_REQUIRE(n == AMT_ATOM_INT_SIZE || static_cast<uint32_t>(number) >> (8 * n) == 0);
    }
    FUZZ_REQUIRE(amt_packet_get_bytes(packet, id, nullptr, 0) == n);
    FUZZ_REQUIRE(amt_packet_get_string(packet, id, nullptr, 0) == n + 1);
    if (capacity != 0) {
        FUZZ_REQUIRE(amt_packet_get_bytes(packet, id, dst.data(), capacity) == std::min(n, capacity));
        const uint32_t count = amt_packet_get_string(packet, id, text, capacity);
        FUZZ_REQUIRE(count == (capacity < n ? capacity - 1 : n));
        FUZZ_REQUIRE(std::all_of(dst.begin() + count, dst.end(), [](uint8_t byte) { return byte == 0; }));
    }
}

void add_atoms(std::vector<uint8_t> area, uint8_t id, uint16_t size)
{
    uint8_t *packet = area.data();
    const std::vector<uint8_t> data(static_cast<size_t>(size) + 1, 'x');
    const std::string text(size, 'x');
    const bool has_room = amt_packet_has_room(packet, size);
    const uint16_t before = amt_packet_get_length(packet);
    amt_packet_add_bytes(packet, id, data.data(), size);
    /* Behind a total length that lies inside the header the atom overwrites the length itself. */
    if (before >= AMT_PACKET_HEADER_SIZE) {
        FUZZ_REQUIRE(amt_packet_get_length(packet) ==
                     (has_room ? before + AMT_ATOM_HEADER_SIZE + size : before));
    }
    amt_packet_add_string(packet, id, text.c_str());
    amt_packet_add_int(packet, id, size);
    amt_packet_add_bool(packet, id, size);
    amt_packet_add_length(packet, size);
    amt_packet_add_int(packet, id, size);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    const uint8_t id = input.take_u8();
    const uint32_t capacity = input.take_u8();
    const uint16_t value_size = input.take_u16();
    const std::vector<uint8_t> area = input.take_area(AMT_PACKET_SIZE);

    for (const uint32_t room : {0U, 1U, capacity, capacity * 257U}) {
        read_atom(area, id, room);
        read_atom(area, 1, room);
    }
    add_atoms(area, id, value_size);
    return 0;
}
