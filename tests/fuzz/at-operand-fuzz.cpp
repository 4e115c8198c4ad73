#include <algorithm>

#include "amt/amt-handle/at/at-operand.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/reader/dispatch.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "pub/error.h"
#include "tests/fuzz/support/input.h"

/* The input is AT text that the PC has sent. Nothing is served, only taken apart. */
namespace {

constexpr const char *PREFIX_LIST[] = {"AT^DCGSNW=", "AT^DMSN=", "AT^DMPCHN=", "AT^DPCBACTRL=", "=", ""};

bool has_no_line_end(const char *text, size_t length)
{
    return std::none_of(text, text + length, [](char c) { return c == '\r' || c == '\n'; });
}

void take_parameters()
{
    for (const char *prefix : PREFIX_LIST) {
        std::vector<char> out(AMT_AT_PARA_SIZE);
        out.shrink_to_fit();
        uint32_t length = 0;
        const int result = handle_amt_get_at_para(prefix, out.data(), &length);
        FUZZ_REQUIRE(result == PUB_ERR_NONE || (result == PUB_ERR_FAIL && length == 0));
        FUZZ_REQUIRE(length <= AMT_AT_PARA_SIZE && has_no_line_end(out.data(), length));
    }
}

void take_operands(const char *text)
{
    static amt_at_operands_st operands;
    amt_at_operands_init(&operands, text);
    uint32_t count = 0;
    for (const char *operand = amt_at_operands_next(&operands); operand != nullptr;
         operand = amt_at_operands_next(&operands))
    {
        FUZZ_REQUIRE(*operand != '\0' && has_no_line_end(operand, strlen(operand)));
        count++;
    }
    FUZZ_REQUIRE(count <= AMT_PACKET_SIZE / 2);
}

void take_quoted(const char *text)
{
    for (const uint32_t capacity : {1U, 2U, 30U, 60U, 127U}) {
        std::vector<char> out(capacity, 'x');
        out.shrink_to_fit();
        amt_at_copy_quoted(text, out.data(), capacity);
        const size_t length = strnlen(out.data(), capacity);
        FUZZ_REQUIRE(length < capacity && has_no_line_end(out.data(), length));
        FUZZ_REQUIRE(memchr(out.data(), '"', length) == nullptr);
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    const std::vector<uint8_t> area = input.take_area(AMT_PACKET_SIZE);
    amt_buf_st &req = g_handle_context.m_req;
    std::copy(area.begin(), area.end(), req.m_buf_a);
    req.m_buf_len = static_cast<uint32_t>(std::min(size, sizeof(req.m_buf_a)));
    const auto *const text = reinterpret_cast<const char *>(req.m_buf_a);

    take_parameters();
    take_operands(text);
    take_quoted(text);
    amt_identity_reset();
    amt_identity_capture(AMT_ID_NO_PACKET);
    return 0;
}
