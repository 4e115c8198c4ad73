#include <algorithm>
#include <benchmark/benchmark.h>
#include <cbor.h>
#include <msgpack.h>
#include <pb_decode.h>
#include <pb_encode.h>
#include <stdint.h>
#include <string.h>

#include "amt/amt-command.h"
#include "amt/amt-packet.h"

/*
 * The same content built and read by four codecs: a command id, two numbers and a text. Each writes into an
 * area of the packet's size, of which it never leaves the end, and reads into a record of fixed size: what is
 * missing, too long or of another type is noticed. An area is cleared first, as a packet's always is: once
 * more they build without that, into what an earlier answer has left. None of them takes memory from the heap where it can do
 * without; only msgpack-c's reader cannot.
 */
namespace {

constexpr char VERSION[] = "VX-KEL-AMT_V1.1_20240131";
constexpr uint32_t TEXT_SIZE = 64;

constexpr uint8_t KEY_RESULT = 1;
constexpr uint8_t KEY_VERSION = 18;
constexpr uint8_t KEY_TYPE = 19;
constexpr uint8_t KEY_COMMAND = 20; /* a packet has a place of its own for it */
constexpr uint32_t KEY_COUNT = 4;

constexpr int32_t TYPE = 17;

uint8_t g_area_a[AMT_PACKET_SIZE];

struct content_st
{
    int32_t m_result;
    char m_version_a[TEXT_SIZE];
    int32_t m_type;
    int32_t m_command;
};

bool is_whole(const content_st &content)
{
    return content.m_result == 0 && content.m_type == TYPE && content.m_command == AMT_VERSION_RSPCMD &&
           strcmp(content.m_version_a, VERSION) == 0;
}

/* Takes a text into the record, terminated; one that is too long is refused. */
bool take_text(content_st *content_ptr, const void *text, size_t length)
{
    if (length >= TEXT_SIZE) {
        return false;
    }
    memcpy(content_ptr->m_version_a, text, length);
    content_ptr->m_version_a[length] = '\0';
    return true;
}

bool take_number(content_st *content_ptr, uint64_t key, int32_t value)
{
    switch (key) {
    case KEY_RESULT:
        content_ptr->m_result = value;
        return true;
    case KEY_TYPE:
        content_ptr->m_type = value;
        return true;
    case KEY_COMMAND:
        content_ptr->m_command = value;
        return true;
    default:
        return true; /* a key that nobody asked for */
    }
}

/* Each returns the length of what it has built, 0 when that does not fit. */

size_t build_packet()
{
    amt_packet_init(g_area_a, AMT_VERSION_RSPCMD);
    amt_packet_add_int(g_area_a, KEY_TYPE, TYPE);
    amt_packet_add_string(g_area_a, KEY_VERSION, VERSION);
    amt_packet_add_int(g_area_a, KEY_RESULT, 0);
    return amt_packet_get_length(g_area_a);
}

bool read_packet(size_t, content_st *content_ptr)
{
    content_ptr->m_command = amt_packet_get_cmd(g_area_a);
    content_ptr->m_result = amt_packet_get_int(g_area_a, KEY_RESULT);
    content_ptr->m_type = amt_packet_get_int(g_area_a, KEY_TYPE);
    return amt_packet_get_string(g_area_a, KEY_VERSION, content_ptr->m_version_a, TEXT_SIZE) < TEXT_SIZE;
}

struct message_st
{
    int32_t result;
    char version[TEXT_SIZE];
    int32_t type;
    int32_t command;
};

/* What nanopb's generator makes of a message with these four fields. */
#define message_st_FIELDLIST(X, a)                                                                           \
    X(a, STATIC, REQUIRED, INT32, result, 1)                                                                 \
    X(a, STATIC, REQUIRED, STRING, version, 18)                                                              \
    X(a, STATIC, REQUIRED, INT32, type, 19)                                                                  \
    X(a, STATIC, REQUIRED, INT32, command, 20)
#define message_st_CALLBACK nullptr
#define message_st_DEFAULT  nullptr
PB_BIND(message_st, message_st, AUTO)

size_t build_nanopb()
{
    message_st message = {};
    message.type = TYPE;
    message.command = AMT_VERSION_RSPCMD;
    memcpy(message.version, VERSION, sizeof(VERSION));
    pb_ostream_t stream = pb_ostream_from_buffer(g_area_a, sizeof(g_area_a));
    return pb_encode(&stream, &message_st_msg, &message) ? stream.bytes_written : 0;
}

bool read_nanopb(size_t length, content_st *content_ptr)
{
    message_st message = {};
    pb_istream_t stream = pb_istream_from_buffer(g_area_a, length);
    if (!pb_decode(&stream, &message_st_msg, &message)) {
        return false;
    }
    content_ptr->m_result = message.result;
    content_ptr->m_type = message.type;
    content_ptr->m_command = message.command;
    memcpy(content_ptr->m_version_a, message.version, TEXT_SIZE);
    return true;
}

/* The piecewise interface of libcbor, which needs no heap. */
class cbor_writer_c {
public:
    void add_number(uint8_t key, uint8_t value)
    {
        m_length += keep(cbor_encode_uint8(key, g_area_a + m_length, room()));
        m_length += keep(cbor_encode_uint8(value, g_area_a + m_length, room()));
    }

    void add_text(uint8_t key, const char *text)
    {
        const size_t n = strlen(text);
        m_length += keep(cbor_encode_uint8(key, g_area_a + m_length, room()));
        m_length += keep(cbor_encode_string_start(n, g_area_a + m_length, room()));
        if (keep(n <= room() ? 1 : 0) != 0) {
            std::copy_n(text, n, g_area_a + m_length);
            m_length += n;
        }
    }

    void start(size_t count)
    {
        m_length += keep(cbor_encode_map_start(count, g_area_a, room()));
    }

    size_t length() const
    {
        return m_is_full ? 0 : m_length;
    }

private:
    size_t room() const
    {
        return sizeof(g_area_a) - m_length;
    }

    size_t keep(size_t written)
    {
        m_is_full = m_is_full || written == 0;
        return written;
    }

    size_t m_length = 0;
    bool m_is_full = false;
};

size_t build_libcbor()
{
    cbor_writer_c writer;
    writer.start(KEY_COUNT);
    writer.add_number(KEY_COMMAND, AMT_VERSION_RSPCMD);
    writer.add_number(KEY_TYPE, TYPE);
    writer.add_text(KEY_VERSION, VERSION);
    writer.add_number(KEY_RESULT, 0);
    return writer.length();
}

struct cbor_state_st
{
    content_st *m_content_ptr;
    bool m_has_key;
    bool m_is_good;
    uint8_t m_key;
};

void take_cbor_number(void *context, uint8_t value)
{
    auto *const state_ptr = static_cast<cbor_state_st *>(context);
    if (state_ptr->m_has_key) {
        take_number(state_ptr->m_content_ptr, state_ptr->m_key, value);
    } else {
        state_ptr->m_key = value;
    }
    state_ptr->m_has_key = !state_ptr->m_has_key;
}

void take_cbor_text(void *context, cbor_data text, size_t length)
{
    auto *const state_ptr = static_cast<cbor_state_st *>(context);
    state_ptr->m_is_good = state_ptr->m_is_good && state_ptr->m_has_key && state_ptr->m_key == KEY_VERSION &&
                           take_text(state_ptr->m_content_ptr, text, length);
    state_ptr->m_has_key = false;
}

bool read_libcbor(size_t length, content_st *content_ptr)
{
    static const cbor_callbacks g_callbacks = [] {
        cbor_callbacks callbacks = cbor_empty_callbacks;
        callbacks.uint8 = take_cbor_number;
        callbacks.string = take_cbor_text;
        return callbacks;
    }();
    cbor_state_st state = {content_ptr, false, true, 0};
    for (size_t offset = 0; offset < length && state.m_is_good;) {
        const cbor_decoder_result result =
            cbor_stream_decode(g_area_a + offset, length - offset, &g_callbacks, &state);
        if (result.status != CBOR_DECODER_FINISHED) {
            return false;
        }
        offset += result.read;
    }
    return state.m_is_good && !state.m_has_key;
}

/* A writer for msgpack-c into the area. */
int write_msgpack(void *context, const char *data, size_t n)
{
    size_t &length = *static_cast<size_t *>(context);
    if (n > sizeof(g_area_a) - length) {
        return -1;
    }
    memcpy(g_area_a + length, data, n);
    length += n;
    return 0;
}

size_t build_msgpack()
{
    size_t length = 0;
    msgpack_packer packer;
    msgpack_packer_init(&packer, &length, write_msgpack);
    const size_t n = strlen(VERSION);
    const bool is_built =
        msgpack_pack_map(&packer, KEY_COUNT) == 0 && msgpack_pack_uint8(&packer, KEY_COMMAND) == 0 &&
        msgpack_pack_int32(&packer, AMT_VERSION_RSPCMD) == 0 && msgpack_pack_uint8(&packer, KEY_TYPE) == 0 &&
        msgpack_pack_int32(&packer, TYPE) == 0 && msgpack_pack_uint8(&packer, KEY_VERSION) == 0 &&
        msgpack_pack_str(&packer, n) == 0 && msgpack_pack_str_body(&packer, VERSION, n) == 0 &&
        msgpack_pack_uint8(&packer, KEY_RESULT) == 0 && msgpack_pack_int32(&packer, 0) == 0;
    return is_built ? length : 0;
}

bool take_msgpack(const msgpack_object_kv &pair, content_st *content_ptr)
{
    if (pair.key.type != MSGPACK_OBJECT_POSITIVE_INTEGER) {
        return false;
    }
    if (pair.key.via.u64 == KEY_VERSION) {
        return pair.val.type == MSGPACK_OBJECT_STR &&
               take_text(content_ptr, pair.val.via.str.ptr, pair.val.via.str.size);
    }
    return pair.val.type == MSGPACK_OBJECT_POSITIVE_INTEGER &&
           take_number(content_ptr, pair.key.via.u64, static_cast<int32_t>(pair.val.via.u64));
}

bool read_msgpack(size_t length, content_st *content_ptr)
{
    msgpack_unpacked unpacked;
    msgpack_unpacked_init(&unpacked);
    const char *const data = reinterpret_cast<const char *>(g_area_a);
    bool is_read = msgpack_unpack_next(&unpacked, data, length, nullptr) == MSGPACK_UNPACK_SUCCESS &&
                   unpacked.data.type == MSGPACK_OBJECT_MAP;
    for (uint32_t i = 0; is_read && i < unpacked.data.via.map.size; i++) {
        is_read = take_msgpack(unpacked.data.via.map.ptr[i], content_ptr);
    }
    msgpack_unpacked_destroy(&unpacked);
    return is_read;
}

using build_t = size_t (*)();
using read_t = bool (*)(size_t length, content_st *content_ptr);

/* What is timed must build the whole content, and what is built must read the same. */
bool is_right(build_t build, read_t read)
{
    content_st content = {-1, {}, -1, -1};
    memset(g_area_a, 0xFF, sizeof(g_area_a));
    const size_t length = build();
    return length != 0 && read(length, &content) && is_whole(content);
}

void build_content(benchmark::State &state, build_t build, read_t read)
{
    if (!is_right(build, read)) {
        state.SkipWithError("not the content");
        return;
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(build());
        benchmark::ClobberMemory();
    }
}

/* As a packet is built: nothing of an earlier answer is left in the area. */
template <build_t build> size_t build_cleared()
{
    amt_packet_clear(g_area_a, sizeof(g_area_a));
    return build();
}

void read_content(benchmark::State &state, build_t build, read_t read)
{
    if (!is_right(build, read)) {
        state.SkipWithError("not the content");
        return;
    }
    const size_t length = build();
    content_st content;
    for (auto _ : state) {
        benchmark::DoNotOptimize(read(length, &content));
        benchmark::ClobberMemory();
    }
}

BENCHMARK_CAPTURE(build_content, packet, build_packet, read_packet);
BENCHMARK_CAPTURE(build_content, nanopb, build_cleared<build_nanopb>, read_nanopb);
BENCHMARK_CAPTURE(build_content, libcbor, build_cleared<build_libcbor>, read_libcbor);
BENCHMARK_CAPTURE(build_content, msgpack_c, build_cleared<build_msgpack>, read_msgpack);
BENCHMARK_CAPTURE(build_content, nanopb_into_what_was, build_nanopb, read_nanopb);
BENCHMARK_CAPTURE(build_content, libcbor_into_what_was, build_libcbor, read_libcbor);
BENCHMARK_CAPTURE(build_content, msgpack_c_into_what_was, build_msgpack, read_msgpack);
BENCHMARK_CAPTURE(read_content, packet, build_packet, read_packet);
BENCHMARK_CAPTURE(read_content, nanopb, build_nanopb, read_nanopb);
BENCHMARK_CAPTURE(read_content, libcbor, build_libcbor, read_libcbor);
BENCHMARK_CAPTURE(read_content, msgpack_c, build_msgpack, read_msgpack);

} // namespace
