#include <errno.h>
#include <string>

#include "pub/error.h"
#include "pub/log/log.h"
#include "tests/fuzz/support/input.h"
#include "tests/fuzz/support/kept-log.h"

/*
 * The input is a run of records: a byte for the kind, then what the kind takes. Every text is made once more here,
 * with other means, and must be the same to the byte; the failing call's errno survives every record.
 */
namespace {

using texts_t = std::vector<std::string>;

constexpr size_t MOST_RECORDS = 32;
constexpr size_t MOST_TEXT = 6000;
constexpr size_t FAIL_TEXT_MOST = 4351;
constexpr int LINE = 77;

const pub_log_source_st g_source = {"tag", "room/file"};
const pub_log_place_st g_place = {g_source, "function", LINE};

std::string hex_of(const std::vector<uint8_t> &bytes)
{
    std::string text;
    for (const uint8_t byte : bytes) {
        char pair_a[3];
        snprintf(pair_a, sizeof(pair_a), "%02X", byte);
        text += pair_a;
    }
    return text;
}

/* Bytes of the input as a C text: what stands in front of the first zero. */
std::string take_text(fuzz_input_c *input_ptr, size_t most)
{
    const std::vector<uint8_t> taken = input_ptr->take(input_ptr->take_u16() % (most + 1));
    const std::string text(taken.begin(), taken.end());
    return text.substr(0, text.find('\0'));
}

std::string error_line(int code, int number)
{
    return "FILE-room/file, LINE-" + std::to_string(LINE) +
           ", FUNC-function(), error_code=" + std::to_string(code) + ", errno=" + std::to_string(number);
}

std::string call_line(const std::string &call, int number)
{
    return "sys call: " + call + "() failed! errno = " + std::to_string(number);
}

texts_t dump(fuzz_input_c *input_ptr)
{
    const std::string title = take_text(input_ptr, 64);
    std::vector<uint8_t> data = input_ptr->take(input_ptr->take_u16() % 4097);
    data.shrink_to_fit();
    pub_log_dump(g_source, title.c_str(), data.data(), static_cast<uint32_t>(data.size()));
    const std::string rest = data.size() > PUB_LOG_DUMP_SIZE ? "..." : "";
    const std::string size = std::to_string(data.size());
    data.resize(data.size() < PUB_LOG_DUMP_SIZE ? data.size() : PUB_LOG_DUMP_SIZE);
    return {title + ": (data_len = " + size + ") -- " + hex_of(data) + rest};
}

texts_t fail(fuzz_input_c *input_ptr, int number)
{
    const int code = static_cast<int>(input_ptr->take_u32());
    const std::string text = take_text(input_ptr, MOST_TEXT);
    FUZZ_REQUIRE(pub_log_fail(g_place, code, "%s|%d", text.c_str(), code) == code);
    return {error_line(code, number), (text + "|" + std::to_string(code)).substr(0, FAIL_TEXT_MOST)};
}

texts_t refuse(fuzz_input_c *input_ptr, int number)
{
    const uint8_t faults = input_ptr->take_u8();
    const auto is = [faults](int bit) { return (faults >> bit & 1) != 0; };
    FUZZ_REQUIRE(pub_log_bad_param(g_place, {is(0), is(1), is(2), is(3), is(4), is(5), is(6), is(7)}) ==
                 PUB_ERR_PARAM);
    std::string flags;
    for (int bit = 0; bit < 8; bit++) {
        flags += std::string(bit == 0 ? "" : ", ") + (is(bit) ? "1" : "0");
    }
    return {error_line(PUB_ERR_PARAM, number), flags};
}

texts_t call(fuzz_input_c *input_ptr, int number)
{
    const std::string name = take_text(input_ptr, 64);
    const int code = static_cast<int>(input_ptr->take_u32());
    const bool is_error_first = input_ptr->take_u8() % 2 == 0;
    const std::string error = error_line(code, number);
    const std::string called = call_line(name, number);
    const int told = is_error_first ? pub_log_error_call(g_place, code, name.c_str())
                                    : pub_log_call_error(g_place, name.c_str(), code);
    FUZZ_REQUIRE(told == code);
    return is_error_first ? texts_t{error, called} : texts_t{called, error};
}

/* A record in the middle of another, as a signal's handler would write it, is dropped. */
texts_t interrupt(fuzz_input_c *input_ptr)
{
    const std::string text = take_text(input_ptr, 64);
    FUZZ_REQUIRE(pub_log_begin());
    PUB_LOG(g_source, "%s", text.c_str());
    pub_log_end();
    pub_log_entry(g_source, text.c_str());
    return {text + "()"};
}

texts_t write_record(fuzz_input_c *input_ptr, int number)
{
    switch (input_ptr->take_u8() % 5) {
    case 0:
        return dump(input_ptr);
    case 1:
        return fail(input_ptr, number);
    case 2:
        return refuse(input_ptr, number);
    case 3:
        return call(input_ptr, number);
    default:
        return interrupt(input_ptr);
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    for (size_t i = 0; i < MOST_RECORDS && !input.is_empty(); i++) {
        const int number = input.take_u8();
        errno = number;
        const texts_t wanted = write_record(&input, number);
        FUZZ_REQUIRE(errno == number);
        FUZZ_REQUIRE(kept_log_take() == wanted);
    }
    return 0;
}
