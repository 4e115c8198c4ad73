#include "tests/unit/support/guarded-area.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

guarded_area_c::guarded_area_c(uint32_t size) : m_size(size)
{
    const size_t page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    const size_t inner = (size + page - 1) / page * page;
    m_map_size = inner + 2 * page;
    m_map_ptr = mmap(nullptr, m_map_size, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    uint8_t *inner_ptr = static_cast<uint8_t *>(m_map_ptr) + page;
    if (m_map_ptr == MAP_FAILED || (inner != 0 && mprotect(inner_ptr, inner, PROT_READ | PROT_WRITE) != 0)) {
        perror("guarded area");
        abort();
    }
    m_data_ptr = inner_ptr + inner - size;
}

guarded_area_c::guarded_area_c(const std::vector<uint8_t> &content)
    : guarded_area_c(static_cast<uint32_t>(content.size()))
{
    if (!content.empty()) {
        memcpy(m_data_ptr, content.data(), content.size());
    }
}

guarded_area_c::~guarded_area_c()
{
    munmap(m_map_ptr, m_map_size);
}

uint8_t *guarded_area_c::data() const
{
    return m_data_ptr;
}

uint32_t guarded_area_c::size() const
{
    return m_size;
}

std::vector<uint8_t> guarded_area_c::head(uint32_t count) const
{
    return std::vector<uint8_t>(m_data_ptr, m_data_ptr + count);
}

std::vector<uint8_t> guarded_area_c::content() const
{
    return head(m_size);
}
