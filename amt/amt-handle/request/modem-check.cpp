#include "amt/amt-handle/request/modem-check.h"

#include <errno.h>
#include <limits.h>
#include <stdlib.h>
#include <string.h>

#include "amt/amt-command.h"
#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/request/request-frame.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

constexpr uint8_t ATOM_SIM_CHECK = 41;
constexpr uint8_t ATOM_SERIAL_NUMBER = 163;
constexpr uint8_t ATOM_STANDBY0_RAT = 202;
constexpr uint8_t RSP_SERIAL_NUMBER = 235;

constexpr uint32_t VALUE_LIMIT = 38;

struct check_st
{
    amt_at_exchange_st m_exchange;
    const char *m_command_ptr;
    const char *m_prefix_ptr;
    const char *m_value_name_ptr; /* in the trace line of the value */
};

/* A value, or as much of it as was kept when it is too long. */
struct check_value_st
{
    int m_status;
    uint32_t m_length;
    char m_text_a[VALUE_LIMIT + 1];
};

constexpr check_st g_support_check = {
    {"amt_query_amt_support", amt_at_trace_en::TEXT, AMT_AT_OK, false, nullptr},
    "AT^DMCC?\r",
    "\r\n^DMCC:",
    "parameter"};
constexpr check_st g_serial_check = {
    {"amt_read_serial_number", amt_at_trace_en::TEXT, AMT_AT_OK, false, nullptr},
    "AT^DMSN\r",
    "\r\n^DMSN:",
    "serial_number"};
constexpr check_st g_sim_check = {{"amt_dtoc_checkSIM", amt_at_trace_en::TEXT, AMT_AT_OK, false, nullptr},
                                  "AT^DTOC\r",
                                  "\r\n^DTOC:",
                                  "board_a"};

/* Runs the exchange and traces its parse. Returns the status of the exchange; that of the value is in
 * *value_ptr. */
int ask_value(const check_st &check, check_value_st *value_ptr)
{
    amt_at_set_command("%s", check.m_command_ptr);
    if (const int status = amt_at_exchange(check.m_exchange, nullptr); status != PUB_ERR_NONE) {
        return status;
    }
    const char *const name = check.m_exchange.m_name_ptr;
    const char *const head = amt_at_find(check.m_prefix_ptr);
    PUB_LOG(g_amt_handle_log, "%s head_ptr=%s", name, head == nullptr ? "(null)" : head);
    value_ptr->m_status =
        amt_at_get_value(check.m_prefix_ptr, VALUE_LIMIT, value_ptr->m_text_a, &value_ptr->m_length);
    PUB_LOG(g_amt_handle_log, "%s %s=%s", name, check.m_value_name_ptr, value_ptr->m_text_a);
    if (value_ptr->m_status != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, value_ptr->m_status, name);
    }
    return PUB_ERR_NONE;
}

/* As atoi; a number out of range becomes the nearest one in it. */
int32_t get_number(const char *text)
{
    const long number = strtol(text, nullptr, 10);
    return static_cast<int32_t>(number > INT32_MAX ? INT32_MAX : number < INT32_MIN ? INT32_MIN : number);
}

/* The last of the four fields of the support answer; null, which is logged, when one is missing. Splits
 * value. */
const char *find_standby0_rat(char *value)
{
    static constexpr const char *field_a[] = {"sim_num", "standby_num", "rf_set_num", "standby0_rat"};
    char *rest = nullptr;
    const char *field = nullptr;
    for (const char *const name : field_a) {
        field = strtok_r(field == nullptr ? value : nullptr, ",", &rest);
        if (field == nullptr) {
            PUB_LOG(g_amt_handle_log, "%s is null!!!", name);
            break;
        }
    }
    return field;
}

} // namespace

int amt_query_amt_support(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (const int status = AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    check_value_st value;
    if (ask_value(g_support_check, &value) != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, AMT_NORMAL_TO_AMT_SUPPORT_RSPCMD);
    }
    const char *const field = find_standby0_rat(value.m_text_a);
    if (field == nullptr) {
        return amt_reply_failed(channel, rsp_ptr, AMT_NORMAL_TO_AMT_SUPPORT_RSPCMD);
    }
    const int32_t standby0_rat = get_number(field);
    PUB_LOG(g_amt_handle_log, "getted nstandby0_rat:%d.", standby0_rat);
    if (value.m_status != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, AMT_NORMAL_TO_AMT_SUPPORT_RSPCMD);
    }
    amt_reply_start(rsp_ptr, AMT_NORMAL_TO_AMT_SUPPORT_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, ATOM_STANDBY0_RAT, standby0_rat);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_read_serial_number(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (const int status = AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    check_value_st value;
    if (ask_value(g_serial_check, &value) != PUB_ERR_NONE || value.m_status != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, RSP_SERIAL_NUMBER);
    }
    PUB_LOG(g_amt_handle_log, "get serial-number success. serial-number:[len:%u content:%s]", value.m_length,
            value.m_text_a);
    amt_reply_start(rsp_ptr, RSP_SERIAL_NUMBER);
    amt_packet_add_bytes(rsp_ptr->m_buf_a, ATOM_SERIAL_NUMBER,
                         reinterpret_cast<const uint8_t *>(value.m_text_a),
                         static_cast<uint16_t>(value.m_length));
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_dtoc_checkSIM(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (const int status = AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    check_value_st value;
    if (ask_value(g_sim_check, &value) != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, AMT_USIMCHECK_RSPCMD);
    }
    const int32_t sim_type = get_number(value.m_text_a);
    PUB_LOG(g_amt_handle_log, "amt_dtoc_checkSIM simtype=%d", sim_type);
    if (value.m_status != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, AMT_USIMCHECK_RSPCMD);
    }
    amt_reply_start(rsp_ptr, AMT_USIMCHECK_RSPCMD);
    amt_packet_add_bool(rsp_ptr->m_buf_a, ATOM_SIM_CHECK, sim_type == 1 || sim_type == 2);
    return amt_handle_finish_rsp(channel, rsp_ptr);
}
