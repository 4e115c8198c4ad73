#include <string.h>

#include "amt/amt-atom.h"
#include "amt/amt-byte-order.h"
#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

/* What one step reads from a block. */
enum class field_en : uint8_t
{
    NONE,
    INT,          /* 4 bytes, big-endian */
    BOOL,         /* 1 byte */
    BYTES,        /* a fixed count of bytes */
    BYTES_U16_LE, /* a count, then so many bytes */
    BYTES_U32_LE,
};

struct step_st
{
    field_en m_field = field_en::NONE;
    uint8_t m_atom_id = 0;
    uint32_t m_count = 0; /* of BYTES */
};

/* Two fields are the most a response has. Only the last one's status counts. */
constexpr uint32_t STEP_COUNT = 2;

struct row_st
{
    uint8_t m_cmd;
    step_st m_step_a[STEP_COUNT];
};

/* What follows the result code, by command. A command without a row has nothing more. */
constexpr row_st g_row_a[] = {
    {AMT_READIMEI_RSPCMD, {{field_en::BYTES, AMT_ATOM_IMEI, 15}}},
    {AMT_RXDATA_RSPCMD, {{field_en::INT, AMT_ATOM_RX_NUMBER}, {field_en::BYTES_U32_LE, AMT_ATOM_DATA}}},
    {AMT_IQPOWER_RSPCMD, {{field_en::INT, AMT_ATOM_IQ_POWER}}},
    {AMT_VERSION_RSPCMD, {{field_en::INT, AMT_ATOM_MODULE}, {field_en::BYTES, AMT_ATOM_VERSION, 64}}},
    {AMT_READTABLE_MEMORY_RSPCMD, {{field_en::BYTES_U32_LE, AMT_ATOM_DATA}}},
    {AMT_READTABLE_FLASH_RSPCMD, {{field_en::BYTES_U32_LE, AMT_ATOM_DATA}}},
    {AMT_GSM_READTABLE_MEMORY_RSPCMD, {{field_en::BYTES_U32_LE, AMT_ATOM_DATA}}},
    {AMT_READ_RFADC_RSPCMD, {{field_en::INT, AMT_ATOM_RF_ADC}}},
    {AMT_IQSERIAL_RSPCMD, {{field_en::BYTES_U32_LE, AMT_ATOM_IQ_SERIAL}}},
    {AMT_USIMCHECK_RSPCMD, {{field_en::BOOL, AMT_ATOM_SIM_CHECK}}},
    {AMT_GSM_TRANSPARENT_CONTROL_RSPCMD, {{field_en::BYTES_U32_LE, AMT_ATOM_GSM_DATA}}},
    {AMT_GSM_READTABLE_FLAG_FLASH_RSPCMD, {{field_en::BOOL, AMT_ATOM_TABLE_FLAG}}},
    {AMT_DSP_TRANSPARENT_CONTROL_RSPCMD, {{field_en::BYTES_U16_LE, AMT_ATOM_DSP_DATA}}},
    {AMT_DSP_TRANSPARENT_CONTROL_INDCMD, {{field_en::BYTES_U16_LE, AMT_ATOM_DSP_DATA}}},
};

/*
 * A count that fits the packet never leads the cursor out of the area: the packet has more in front of the
 * bytes than the block ever has.
 */
constexpr uint32_t MOST_BEFORE_BYTES = sizeof(uint8_t) + 3 * sizeof(uint32_t);
static_assert(AMT_PACKET_HEADER_SIZE + 2 * AMT_ATOM_HEADER_SIZE + AMT_ATOM_INT_SIZE >= MOST_BEFORE_BYTES);

const row_st *find_row(uint8_t cmd)
{
    for (const row_st &row : g_row_a) {
        if (row.m_cmd == cmd) {
            return &row;
        }
    }
    return nullptr;
}

bool is_target_absent(const uint8_t **cursor)
{
    return cursor == nullptr || *cursor == nullptr;
}

uint32_t read_count(const uint8_t **cursor, const step_st &step)
{
    uint32_t count = step.m_count;
    if (step.m_field == field_en::BYTES_U16_LE) {
        count = amt_get_u16_le(*cursor);
        *cursor += sizeof(uint16_t);
    } else if (step.m_field == field_en::BYTES_U32_LE) {
        count = amt_get_u32_le(*cursor);
        *cursor += sizeof(uint32_t);
    }
    return count;
}

int run_step(const uint8_t **cursor, uint8_t *packet, const step_st &step)
{
    if (step.m_field == field_en::INT) {
        return rsp_at_data_2_amt_data_atom_int(cursor, packet, step.m_atom_id);
    }
    if (step.m_field == field_en::BOOL) {
        return rsp_at_data_2_amt_data_atom_bool(cursor, packet, step.m_atom_id);
    }
    const uint32_t count = read_count(cursor, step);
    return rsp_at_data_2_amt_data_atom_byte(cursor, packet, count, step.m_atom_id);
}

int run_row(const uint8_t **cursor, uint8_t *packet, const row_st &row)
{
    int status = PUB_ERR_NONE;
    for (const step_st &step : row.m_step_a) {
        if (step.m_field != field_en::NONE) {
            status = run_step(cursor, packet, step);
        }
    }
    return status;
}

/* The check of the steps that read a field of fixed size. The last flag is the atom id's: any id will do. */
int check_step(const uint8_t **cursor, const uint8_t *packet,
               const pub_log_place_st &place = g_amt_convert_log)
{
    if (!is_target_absent(cursor) && packet != nullptr) {
        return PUB_ERR_NONE;
    }
    return pub_log_bad_param(place, {cursor == nullptr, is_target_absent(cursor), packet == nullptr, false});
}

} // namespace

int rsp_at_data_2_amt_data_atom_int(const uint8_t **cursor, uint8_t *packet, uint8_t atom_id)
{
    if (check_step(cursor, packet) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_packet_add_int(packet, atom_id, static_cast<int32_t>(amt_get_u32_be(*cursor)));
    *cursor += AMT_ATOM_INT_SIZE;
    return PUB_ERR_NONE;
}

int rsp_at_data_2_amt_data_atom_bool(const uint8_t **cursor, uint8_t *packet, uint8_t atom_id)
{
    if (check_step(cursor, packet) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_packet_add_bool(packet, atom_id, **cursor);
    *cursor += AMT_ATOM_BOOL_SIZE;
    return PUB_ERR_NONE;
}

int rsp_at_data_2_amt_data_atom_byte(const uint8_t **cursor, uint8_t *packet, uint32_t count, uint8_t atom_id)
{
    if (is_target_absent(cursor) || packet == nullptr || count == 0) {
        return pub_log_bad_param(g_amt_convert_log, {cursor == nullptr, is_target_absent(cursor),
                                                     packet == nullptr, count == 0, false});
    }
    if (!amt_packet_has_room(packet, count)) {
        return pub_log_fail(g_amt_convert_log, PUB_ERR_FAIL, "atom of %u bytes does not fit the packet",
                            count);
    }
    amt_packet_add_bytes(packet, atom_id, *cursor, static_cast<uint16_t>(count));
    *cursor += count;
    return PUB_ERR_NONE;
}

int amt_convert_rsp_at_data_2_amt_data(const uint8_t *block, uint32_t len, uint8_t *packet, uint32_t capacity)
{
    pub_log_entry(g_amt_convert_log);
    if (block == nullptr || len == 0 || packet == nullptr || capacity != AMT_PACKET_SIZE) {
        return pub_log_bad_param(
            g_amt_convert_log, {block == nullptr, len == 0, packet == nullptr, capacity != AMT_PACKET_SIZE});
    }
    /* The fields may claim more than the block has: what lies behind it reads as zero bytes, to the end of
     * the area. */
    uint8_t area_a[AMT_PACKET_SIZE] = {};
    memcpy(area_a, block, len < sizeof(area_a) ? len : sizeof(area_a));

    const uint8_t *cursor = area_a;
    const uint8_t cmd = *cursor++;
    amt_packet_init(packet, cmd);
    /* All that it needs is there. */
    const int status = rsp_at_data_2_amt_data_atom_int(&cursor, packet, AMT_ATOM_RESULT);
    if (static_cast<uint32_t>(cursor - area_a) >= len) {
        return status;
    }
    const row_st *row_ptr = find_row(cmd);
    return row_ptr == nullptr ? PUB_ERR_NONE : run_row(&cursor, packet, *row_ptr);
}
