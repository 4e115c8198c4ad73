#include <algorithm>

#include "amt/amt-convert.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/fuzz/support/input.h"

/* The first 2 bytes are the block's capacity, the rest is the start of the packet's area. */
extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    const uint32_t capacity = input.take_u16() % (AMT_PACKET_SIZE + 1);
    const std::vector<uint8_t> area = input.take_area(AMT_PACKET_SIZE);
    std::vector<uint8_t> block(capacity, 0x77);
    block.shrink_to_fit();

    uint32_t length = 0;
    const int result = amt_convert_req_amt_data_2_at_data(area.data(), block.data(), capacity, &length);
    if (capacity == 0) {
        FUZZ_REQUIRE(result == PUB_ERR_PARAM);
        return 0;
    }
    FUZZ_REQUIRE(result == PUB_ERR_NONE || result == PUB_ERR_FAIL);
    FUZZ_REQUIRE(length <= capacity);
    FUZZ_REQUIRE(result == PUB_ERR_FAIL || block[0] == amt_packet_get_cmd(area.data()));
    FUZZ_REQUIRE(std::all_of(block.begin() + length, block.end(), [](uint8_t byte) { return byte == 0; }));
    return 0;
}
