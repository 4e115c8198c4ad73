#pragma once

#include <stddef.h>
#include <stdint.h>
#include <vector>

/*
 * Memory of an exact size between two pages that fault, its last byte right before the second one: an access
 * behind it ends the test, in every build. A size that is a whole page is guarded on both sides.
 */
class guarded_area_c {
public:
    explicit guarded_area_c(uint32_t size);
    explicit guarded_area_c(const std::vector<uint8_t> &content);
    ~guarded_area_c();
    guarded_area_c(const guarded_area_c &) = delete;
    guarded_area_c &operator=(const guarded_area_c &) = delete;

    uint8_t *data() const;
    uint32_t size() const;

    /* A copy of the first count bytes, or of everything. */
    std::vector<uint8_t> head(uint32_t count) const;
    std::vector<uint8_t> content() const;

private:
    void *m_map_ptr;
    size_t m_map_size;
    uint8_t *m_data_ptr;
    uint32_t m_size;
};
