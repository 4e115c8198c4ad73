#pragma once

#include <signal.h>
#include <stddef.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <vector>

/* What every target defines: one run over the bytes that somebody hostile has sent. */
extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size);

/* Takes an input apart from its front. Behind its end everything reads as 0. */
class fuzz_input_c {
public:
    fuzz_input_c(const uint8_t *data, size_t size) : m_data_ptr(data), m_size(size) {}

    bool is_empty() const
    {
        return m_size == 0;
    }

    uint8_t take_u8()
    {
        if (m_size == 0) {
            return 0;
        }
        m_size--;
        return *m_data_ptr++;
    }

    uint16_t take_u16()
    {
        const uint16_t low = take_u8();
        return static_cast<uint16_t>(low | take_u8() << 8);
    }

    uint32_t take_u32()
    {
        const uint32_t low = take_u16();
        return low | static_cast<uint32_t>(take_u16()) << 16;
    }

    /* The next bytes, at most limit. */
    std::vector<uint8_t> take(size_t limit)
    {
        const size_t count = m_size < limit ? m_size : limit;
        std::vector<uint8_t> bytes(m_data_ptr, m_data_ptr + count);
        m_data_ptr += count;
        m_size -= count;
        return bytes;
    }

    /* The next bytes as an area of exactly this size, zero bytes behind the input. */
    std::vector<uint8_t> take_area(size_t size)
    {
        std::vector<uint8_t> area = take(size);
        area.resize(size);
        area.shrink_to_fit();
        return area;
    }

private:
    const uint8_t *m_data_ptr;
    size_t m_size;
};

/* What must hold for every input; the target ends as a finding otherwise. */
#define FUZZ_REQUIRE(condition)                                                                              \
    do {                                                                                                     \
        if (!(condition)) {                                                                                  \
            fprintf(stderr, "%s:%d: does not hold: %s\n", __FILE__, __LINE__, #condition);                   \
            raise(SIGABRT);                                                                                  \
        }                                                                                                    \
    } while (0)
