#include "amt/amt-device/device-text.h"

#include "amt/amt-packet.h"

uint32_t amt_device_get_text(const amt_buf_st *req_ptr, uint8_t atom_id, char *dst, uint32_t capacity)
{
    dst[0] = '\0';
    const uint32_t taken = amt_packet_get_string(req_ptr->m_buf_a, atom_id, dst, capacity);
    if (taken < capacity) {
        return taken;
    }
    /* A value of exactly the capacity comes without a terminating zero. */
    dst[capacity - 1] = '\0';
    return capacity - 1;
}
