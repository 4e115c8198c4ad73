#include <algorithm>

#include "amt/amt-convert.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/fuzz/support/input.h"

/* The input is a modem's block: read at its exact size, then at the start of an area as the service has it.
 */
namespace {

/* The response, after what must hold for every one. */
std::vector<uint8_t> convert(const std::vector<uint8_t> &memory, uint32_t length, int *result_ptr)
{
    std::vector<uint8_t> packet(AMT_PACKET_SIZE, 0x77);
    const int result =
        amt_convert_rsp_at_data_2_amt_data(memory.data(), length, packet.data(), AMT_PACKET_SIZE);
    *result_ptr = result;
    FUZZ_REQUIRE(result == PUB_ERR_NONE || result == PUB_ERR_FAIL || result == PUB_ERR_PARAM);
    const uint16_t total = amt_packet_get_length(packet.data());
    FUZZ_REQUIRE(total >= 15 && total <= AMT_PACKET_SIZE);
    FUZZ_REQUIRE(amt_packet_get_cmd(packet.data()) == memory[0]);
    FUZZ_REQUIRE(amt_packet_find_atom(packet.data(), 1) == packet.data() + 9);
    FUZZ_REQUIRE(std::all_of(packet.begin() + total, packet.end(), [](uint8_t byte) { return byte == 0; }));
    return packet;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    std::vector<uint8_t> block = input.take(AMT_PACKET_SIZE);
    if (block.empty()) {
        return 0;
    }
    block.shrink_to_fit();
    const uint32_t length = static_cast<uint32_t>(block.size());
    int exact_result = 0;
    const std::vector<uint8_t> exact = convert(block, length, &exact_result);

    block.resize(AMT_PACKET_SIZE);
    int area_result = 0;
    FUZZ_REQUIRE(convert(block, length, &area_result) == exact);
    FUZZ_REQUIRE(area_result == exact_result);

    /* What a response packet says can be asked back as a request. */
    if (exact_result == PUB_ERR_NONE) {
        uint32_t back_length = 0;
        FUZZ_REQUIRE(amt_convert_req_amt_data_2_at_data(exact.data(), block.data(), AMT_PACKET_SIZE,
                                                        &back_length) == PUB_ERR_NONE);
    }
    return 0;
}
