#include <benchmark/benchmark.h>
#include <stdint.h>
#include <string.h>
#include <vector>

#include "amt/amt-byte-order.h"
#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

/*
 * The pure parts of a request's road, one by one: build and read a packet, wrap and strip its envelope,
 * convert to and from the modem's blocks. Arguments are sizes in bytes. Log texts are formatted as in
 * service, then dropped.
 */
namespace {

constexpr uint8_t ATOM_RESULT = 1;

/* What a typical answer looks like: result, type, a text. */
void build_response(uint8_t *packet)
{
    amt_packet_init(packet, AMT_VERSION_RSPCMD);
    amt_packet_add_int(packet, 19, 17);
    amt_packet_add_string(packet, 18, "VX-KEL-AMT_V1.1_20240131");
    amt_packet_add_int(packet, ATOM_RESULT, 0);
}

/* A packet of one bytes atom, size bytes in all. */
void build_packet_of(uint8_t *packet, uint32_t size)
{
    const std::vector<uint8_t> data(size, 0x5A);
    amt_packet_init(packet, AMT_WRITETABLE_MEMORY_CMD);
    amt_packet_add_bytes(packet, 4, data.data(),
                         static_cast<uint16_t>(size - AMT_PACKET_HEADER_SIZE - AMT_ATOM_HEADER_SIZE));
}

void count_bytes(benchmark::State &state)
{
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * state.range(0));
}

void packet_init(benchmark::State &state)
{
    uint8_t packet_a[AMT_PACKET_SIZE];
    for (auto _ : state) {
        amt_packet_init(packet_a, AMT_VERSION_RSPCMD);
        benchmark::ClobberMemory();
    }
}
BENCHMARK(packet_init);

void packet_build(benchmark::State &state)
{
    uint8_t packet_a[AMT_PACKET_SIZE];
    for (auto _ : state) {
        build_response(packet_a);
        benchmark::ClobberMemory();
    }
}
BENCHMARK(packet_build);

void packet_read(benchmark::State &state)
{
    uint8_t packet_a[AMT_PACKET_SIZE];
    build_response(packet_a);
    char text_a[64];
    for (auto _ : state) {
        benchmark::DoNotOptimize(amt_packet_get_int(packet_a, 19));
        benchmark::DoNotOptimize(amt_packet_get_int(packet_a, ATOM_RESULT));
        benchmark::DoNotOptimize(amt_packet_get_string(packet_a, 18, text_a, sizeof(text_a)));
        benchmark::ClobberMemory();
    }
}
BENCHMARK(packet_read);

/* The last of as many integer atoms as fit: the longest search there is. */
void packet_find_last(benchmark::State &state)
{
    uint8_t packet_a[AMT_PACKET_SIZE];
    amt_packet_init(packet_a, 1);
    while (amt_packet_has_room(packet_a, 2 * (AMT_ATOM_HEADER_SIZE + AMT_ATOM_INT_SIZE))) {
        amt_packet_add_int(packet_a, 1, 0);
    }
    amt_packet_add_int(packet_a, 2, 42);
    for (auto _ : state) {
        benchmark::DoNotOptimize(amt_packet_get_int(packet_a, 2));
    }
}
BENCHMARK(packet_find_last);

void checksum(benchmark::State &state)
{
    const std::vector<uint8_t> data(static_cast<size_t>(state.range(0)), 0x5A);
    for (auto _ : state) {
        benchmark::DoNotOptimize(amt_checksum(data.data(), static_cast<uint32_t>(data.size())));
    }
    count_bytes(state);
}

/* The same checksum with one table, a byte at a time: what a faster one is measured by. */
uint32_t checksum_by_bytes(const uint32_t *entry_a, const uint8_t *data, uint32_t length)
{
    uint32_t crc = 0;
    for (uint32_t i = 0; i < length; i++) {
        crc = ((crc << 8) | data[i]) ^ entry_a[crc >> 24];
    }
    for (uint32_t i = 0; i < sizeof(crc); i++) {
        crc = (crc << 8) ^ entry_a[crc >> 24];
    }
    return crc;
}

void checksum_byte_by_byte(benchmark::State &state)
{
    uint32_t entry_a[256];
    for (uint32_t i = 0; i < 256; i++) {
        const uint8_t byte = static_cast<uint8_t>(i);
        entry_a[i] = amt_checksum(&byte, sizeof(byte)); /* what one byte alone gives is its entry */
    }
    const std::vector<uint8_t> data(static_cast<size_t>(state.range(0)), 0x5A);
    const uint32_t length = static_cast<uint32_t>(data.size());
    if (checksum_by_bytes(entry_a, data.data(), length) != amt_checksum(data.data(), length)) {
        state.SkipWithError("not the same checksum");
        return;
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(checksum_by_bytes(entry_a, data.data(), length));
    }
    count_bytes(state);
}

/* From a few bytes, where it begins to pay, to far more than a frame. */
void checksum_lengths(benchmark::internal::Benchmark *bench_ptr)
{
    for (const int64_t length : {4, 6, 7, 8, 12, 16, 18, 27, 64, 256, 4096, 65536}) {
        bench_ptr->Arg(length);
    }
}
BENCHMARK(checksum)->Apply(checksum_lengths);
BENCHMARK(checksum_byte_by_byte)->Apply(checksum_lengths);

void envelope_wrap_and_strip(benchmark::State &state)
{
    static amt_buf_st buf;
    build_packet_of(buf.m_buf_a, static_cast<uint32_t>(state.range(0)));
    buf.m_buf_len = 0;
    for (auto _ : state) {
        if (amt_convert_app_2_pc(&buf) != PUB_ERR_NONE || amt_convert_pc_2_app(&buf) != PUB_ERR_NONE) {
            state.SkipWithError("not converted");
            break;
        }
        benchmark::ClobberMemory();
    }
    count_bytes(state);
}
BENCHMARK(envelope_wrap_and_strip)->Arg(15)->Arg(256)->Arg(4080);

void envelope_strip(benchmark::State &state)
{
    static amt_buf_st frame;
    static amt_buf_st buf;
    build_packet_of(frame.m_buf_a, static_cast<uint32_t>(state.range(0)));
    frame.m_buf_len = 0;
    amt_convert_app_2_pc(&frame);
    for (auto _ : state) {
        buf.m_buf_len = frame.m_buf_len;
        memcpy(buf.m_buf_a, frame.m_buf_a, frame.m_buf_len);
        if (amt_convert_pc_2_app(&buf) != PUB_ERR_NONE) {
            state.SkipWithError("not converted");
            break;
        }
        benchmark::ClobberMemory();
    }
    count_bytes(state);
}
BENCHMARK(envelope_strip)->Arg(15)->Arg(256)->Arg(4080);

void request_to_block(benchmark::State &state)
{
    uint8_t packet_a[AMT_PACKET_SIZE];
    uint8_t block_a[AMT_PACKET_SIZE];
    uint32_t length = 0;
    build_packet_of(packet_a, static_cast<uint32_t>(state.range(0)));
    for (auto _ : state) {
        if (amt_convert_req_amt_data_2_at_data(packet_a, block_a, sizeof(block_a), &length) != PUB_ERR_NONE) {
            state.SkipWithError("not converted");
            break;
        }
        benchmark::ClobberMemory();
    }
    count_bytes(state);
}
BENCHMARK(request_to_block)->Arg(15)->Arg(256)->Arg(4096);

/* A block of a table read: id, result, length, bytes; the argument is its size. */
void block_to_response(benchmark::State &state)
{
    constexpr uint32_t BEFORE_BYTES = 9;
    uint8_t packet_a[AMT_PACKET_SIZE];
    uint8_t block_a[AMT_PACKET_SIZE] = {AMT_READTABLE_MEMORY_RSPCMD};
    const uint32_t length = static_cast<uint32_t>(state.range(0));
    amt_put_u32_le(block_a + BEFORE_BYTES - sizeof(uint32_t), length - BEFORE_BYTES);
    for (auto _ : state) {
        if (amt_convert_rsp_at_data_2_amt_data(block_a, length, packet_a, sizeof(packet_a)) != PUB_ERR_NONE) {
            state.SkipWithError("not converted");
            break;
        }
        benchmark::ClobberMemory();
    }
    count_bytes(state);
}
BENCHMARK(block_to_response)->Arg(10)->Arg(256)->Arg(4085);

} // namespace
