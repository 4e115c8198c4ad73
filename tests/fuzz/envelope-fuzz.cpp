#include <algorithm>
#include <memory>

#include "amt/amt-convert.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/fuzz/support/input.h"

/* The first 4 bytes are the buffer's length, the rest is the start of its data. */
extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    const auto buf = std::make_unique<amt_buf_st>();
    buf->m_buf_len = input.take_u32();
    const std::vector<uint8_t> area = input.take_area(AMT_PACKET_SIZE);
    std::copy(area.begin(), area.end(), buf->m_buf_a);
    const amt_buf_st before = *buf;

    /* Whatever is stripped was an envelope. */
    if (amt_convert_pc_2_app(buf.get()) == PUB_ERR_NONE) {
        FUZZ_REQUIRE(buf->m_buf_len + AMT_ENVELOPE_OVERHEAD == before.m_buf_len);
        FUZZ_REQUIRE(memcmp(buf->m_buf_a, before.m_buf_a + AMT_ENVELOPE_HEAD_SIZE, buf->m_buf_len) == 0);
    } else {
        FUZZ_REQUIRE(memcmp(buf.get(), &before, sizeof(before)) == 0);
    }

    /* Whatever is wrapped comes back. */
    *buf = before;
    const int result = amt_convert_app_2_pc(buf.get());
    if (result != PUB_ERR_NONE) {
        FUZZ_REQUIRE(result == PUB_ERR_PARAM && memcmp(buf.get(), &before, sizeof(before)) == 0);
        return 0;
    }
    const uint32_t length = buf->m_buf_len - AMT_ENVELOPE_OVERHEAD;
    FUZZ_REQUIRE(length ==
                 (before.m_buf_len != 0 ? before.m_buf_len : amt_packet_get_length(before.m_buf_a)));
    FUZZ_REQUIRE(amt_convert_pc_2_app(buf.get()) == PUB_ERR_NONE);
    FUZZ_REQUIRE(buf->m_buf_len == length && memcmp(buf->m_buf_a, before.m_buf_a, length) == 0);
    return 0;
}
