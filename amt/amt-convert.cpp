#include "amt/amt-convert.h"

#include <string.h>

#include "amt/amt-byte-order.h"
#include "amt/amt-command.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

/* Flag A, flag B and the reserved word. */
constexpr uint8_t g_flag_a[] = {AMT_ENVELOPE_FLAG_A, AMT_ENVELOPE_FLAG_B, 0, 0};

constexpr uint32_t ANY_LENGTH = UINT32_MAX;

/* The length in bytes that a value of a type must have in a request. */
struct length_rule_st
{
    uint8_t m_type;
    uint32_t m_length;
};

constexpr length_rule_st g_length_rule_a[] = {
    {AMT_ATOM_TYPE_INT, AMT_ATOM_INT_SIZE},
    {AMT_ATOM_TYPE_STRING, ANY_LENGTH},
    {AMT_ATOM_TYPE_BYTES, ANY_LENGTH},
    {AMT_ATOM_TYPE_BOOL, AMT_ATOM_BOOL_SIZE},
};

const length_rule_st *find_length_rule(uint8_t type)
{
    for (const length_rule_st &rule : g_length_rule_a) {
        if (rule.m_type == type) {
            return &rule;
        }
    }
    return nullptr;
}

/* A block under construction. */
struct block_st
{
    uint8_t *m_out_ptr;
    uint32_t m_capacity;
    uint32_t *m_length_ptr;
};

bool append(const block_st &block, const uint8_t *data, uint32_t n)
{
    if (n > block.m_capacity - *block.m_length_ptr) {
        return false;
    }
    memcpy(block.m_out_ptr + *block.m_length_ptr, data, n);
    *block.m_length_ptr += n;
    return true;
}

} // namespace

int amt_convert_req_amt_data_2_at_data(const uint8_t *packet, uint8_t *out, uint32_t capacity,
                                       uint32_t *out_len)
{
    pub_log_entry(g_amt_convert_log);
    if (packet == nullptr || out == nullptr || capacity == 0 || out_len == nullptr) {
        return pub_log_bad_param(g_amt_convert_log,
                                 {packet == nullptr, out == nullptr, capacity == 0, out_len == nullptr});
    }
    amt_packet_clear(out, capacity);
    *out_len = 0;
    const uint8_t head = packet[AMT_PACKET_HEAD_OFFSET];
    if (head != AMT_PACKET_HEAD) {
        return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "command head mismatch: %02X != %02X", head,
                            AMT_PACKET_HEAD);
    }
    const uint8_t cmd = amt_packet_get_cmd(packet);
    const block_st block = {out, capacity, out_len};
    append(block, &cmd, sizeof(cmd));

    uint32_t offset = AMT_PACKET_HEADER_SIZE;
    const uint32_t end = offset + amt_get_u16_le(packet + AMT_PACKET_ATOM_LENGTH_OFFSET);
    while (offset < end) {
        if (offset + AMT_ATOM_HEADER_SIZE > AMT_PACKET_SIZE) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "atom at %u leads outside the packet",
                                offset);
        }
        const uint8_t *atom = packet + offset;
        if (atom[0] != AMT_ATOM_HEAD) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "atom head mismatch: %02X != %02X", atom[0],
                                AMT_ATOM_HEAD);
        }
        const uint8_t *length_field = atom + AMT_ATOM_LENGTH_OFFSET;
        if (cmd == AMT_DSP_TRANSPARENT_CONTROL_CMD && !append(block, length_field, sizeof(uint16_t))) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "block of %u bytes is full", capacity);
        }
        const uint16_t length = amt_get_u16_le(length_field);
        const uint8_t type = atom[AMT_ATOM_TYPE_OFFSET];
        const length_rule_st *rule_ptr = find_length_rule(type);
        if (rule_ptr == nullptr) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "unknown atom value type: %02X", type);
        }
        if (rule_ptr->m_length != ANY_LENGTH && length != rule_ptr->m_length) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "atom length mismatch: %02X != %02X", length,
                                rule_ptr->m_length);
        }
        const uint32_t atom_size = AMT_ATOM_HEADER_SIZE + length;
        if (offset + atom_size > AMT_PACKET_SIZE) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "atom at %u leads outside the packet",
                                offset);
        }
        if (!append(block, atom + AMT_ATOM_HEADER_SIZE, length)) {
            return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "block of %u bytes is full", capacity);
        }
        offset += atom_size;
    }
    return PUB_ERR_NONE;
}

int amt_convert_pc_2_app(amt_buf_st *buf_ptr)
{
    pub_log_entry(g_amt_convert_log);
    if (buf_ptr == nullptr || buf_ptr->m_buf_len == 0) {
        return pub_log_bad_param(g_amt_convert_log, {buf_ptr == nullptr, buf_ptr != nullptr});
    }
    uint8_t *data = buf_ptr->m_buf_a;
    const uint32_t length = buf_ptr->m_buf_len;
    if (length <= AMT_ENVELOPE_OVERHEAD || length > sizeof(buf_ptr->m_buf_a) ||
        amt_get_u32_le(data) != AMT_ENVELOPE_MAGIC)
    {
        return PUB_ERR_FAIL;
    }
    memmove(data, data + AMT_ENVELOPE_HEAD_SIZE, length - AMT_ENVELOPE_HEAD_SIZE);
    buf_ptr->m_buf_len = length - AMT_ENVELOPE_OVERHEAD;
    return PUB_ERR_NONE;
}

int amt_convert_app_2_pc(amt_buf_st *buf_ptr)
{
    pub_log_entry(g_amt_convert_log);
    if (buf_ptr == nullptr) {
        return pub_log_bad_param(g_amt_convert_log, {true});
    }
    uint8_t *data = buf_ptr->m_buf_a;
    const uint32_t length = buf_ptr->m_buf_len != 0 ? buf_ptr->m_buf_len : amt_packet_get_length(data);
    if (length == 0 || length > sizeof(buf_ptr->m_buf_a) - AMT_ENVELOPE_OVERHEAD) {
        return pub_log_bad_param(g_amt_convert_log, {true});
    }
    memmove(data + AMT_ENVELOPE_HEAD_SIZE, data, length);
    amt_put_u32_le(data, AMT_ENVELOPE_MAGIC);
    amt_put_u32_le(data + AMT_ENVELOPE_LENGTH_OFFSET,
                   length + AMT_ENVELOPE_OVERHEAD - AMT_ENVELOPE_FLAG_OFFSET);
    memcpy(data + AMT_ENVELOPE_FLAG_OFFSET, g_flag_a, sizeof(g_flag_a));
    const uint32_t checked = AMT_ENVELOPE_HEAD_SIZE + length;
    amt_put_u32_le(data + checked, amt_checksum(data, checked));
    buf_ptr->m_buf_len = length + AMT_ENVELOPE_OVERHEAD;
    return PUB_ERR_NONE;
}
