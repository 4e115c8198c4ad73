#include "amt/amt-handle/request/modem-value.h"

#include <errno.h>
#include <inttypes.h>
#include <limits.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/channel/at-io.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "pub/file/scan.h"

namespace {

constexpr uint32_t VALUE_LIMIT = 38;
constexpr uint32_t OUTDATE_LIMIT = 14;

/* An erased record of the modem begins with this byte. */
constexpr char ERASED = '\xFF';

/* Relative to the working directory, which is the root directory in service. */
constexpr const char *TEMPERATURE_FILE = "sys/class/power_supply/battery/temp";

/* A value, or as much of it as was kept when it is too long. */
struct value_st
{
    int m_status;
    uint32_t m_length;
    char m_text_a[VALUE_LIMIT + 1];
};
static_assert(VALUE_LIMIT < sizeof(value_st::m_text_a));

/* How a value is asked for and answered. */
struct question_st
{
    const char *m_name_ptr; /* of the handler, which the log shows */
    const char *m_command_ptr;
    const char *m_prefix_ptr;
    const char *m_trace_name_ptr; /* of the value in the lines that trace all; null: there are none */
    uint32_t m_limit;             /* characters, at most VALUE_LIMIT */
    uint8_t m_rsp_id;
    int (*m_put)(uint8_t *packet, value_st *value_ptr); /* into the answer; its failure is the request's */
    bool m_is_put_when_bad = false; /* a value that is too long is put as well, and fails only after that */
    bool m_has_result = true;       /* the answer ends with result 0 */
};

/* As atoi; a number out of range becomes the nearest one in it. */
int32_t get_number(const char *text)
{
    const long number = strtol(text, nullptr, 10);
    return static_cast<int32_t>(number > INT32_MAX ? INT32_MAX : number < INT32_MIN ? INT32_MIN : number);
}

int put_board(uint8_t *packet, value_st *value_ptr)
{
    amt_packet_add_string(packet, AMT_ATOM_BOARD, value_ptr->m_text_a);
    return PUB_ERR_NONE;
}

int put_outdate(uint8_t *packet, value_st *value_ptr)
{
    if (value_ptr->m_text_a[0] == ERASED) {
        return pub_log_error({g_amt_handle_log, "amt_modem_handle_read_outdate"}, PUB_ERR_FAIL);
    }
    amt_packet_add_string(packet, AMT_ATOM_OUTDATE, value_ptr->m_text_a);
    return PUB_ERR_NONE;
}

int put_serial_number(uint8_t *packet, value_st *value_ptr)
{
    PUB_LOG(g_amt_handle_log, "get serial-number success. serial-number:[len:%u content:%s]",
            value_ptr->m_length, value_ptr->m_text_a);
    amt_packet_add_bytes(packet, AMT_ATOM_SERIAL_NUMBER,
                         reinterpret_cast<const uint8_t *>(value_ptr->m_text_a),
                         static_cast<uint16_t>(value_ptr->m_length));
    return PUB_ERR_NONE;
}

int put_support(uint8_t *packet, value_st *value_ptr)
{
    char *text = value_ptr->m_text_a;
    char *rest = nullptr;
    const char *field = "";
    for (const char *const name : {"sim_num", "standby_num", "rf_set_num", "standby0_rat"}) {
        field = strtok_r(text, ",", &rest);
        text = nullptr;
        if (field == nullptr) {
            return pub_log_fail({g_amt_handle_log, "amt_query_amt_support"}, PUB_ERR_FAIL, "%s is null!!!",
                                name);
        }
    }
    const int32_t standby0_rat = get_number(field);
    PUB_LOG(g_amt_handle_log, "getted nstandby0_rat:%d.", standby0_rat);
    amt_packet_add_int(packet, AMT_ATOM_STANDBY0_RAT, standby0_rat);
    return PUB_ERR_NONE;
}

int put_sim(uint8_t *packet, value_st *value_ptr)
{
    const int32_t sim_type = get_number(value_ptr->m_text_a);
    PUB_LOG(g_amt_handle_log, "amt_dtoc_checkSIM simtype=%d", sim_type);
    amt_packet_add_bool(packet, AMT_ATOM_SIM_CHECK, sim_type == 1 || sim_type == 2);
    return PUB_ERR_NONE;
}

constexpr question_st g_board_question = {
    "amt_modem_handle_read_board", "AT^DMSN\r", "\r\n^DMSN:", nullptr, VALUE_LIMIT,
    AMT_READ_BOARD_RSPCMD,         put_board};
constexpr question_st g_outdate_question = {
    "amt_modem_handle_read_outdate", "AT^DMFD?\?\r", "\r\n^DMFD:", nullptr, OUTDATE_LIMIT,
    AMT_READ_OUTDATE_RSPCMD,         put_outdate};
constexpr question_st g_serial_question = {
    "amt_read_serial_number",      "AT^DMSN\r",      "\r\n^DMSN:", "serial_number", VALUE_LIMIT,
    AMT_READ_SERIAL_NUMBER_RSPCMD, put_serial_number};
constexpr question_st g_support_question = {
    "amt_query_amt_support",          "AT^DMCC?\r", "\r\n^DMCC:", "parameter", VALUE_LIMIT,
    AMT_NORMAL_TO_AMT_SUPPORT_RSPCMD, put_support,  true};
constexpr question_st g_sim_question = {
    "amt_dtoc_checkSIM",  "AT^DTOC\r", "\r\n^DTOC:", "board_a", VALUE_LIMIT,
    AMT_USIMCHECK_RSPCMD, put_sim,     true,         false};

/*
 * Asks the modem. Returns the status of the exchange; that of the value, which some answers are made from when
 * it is too long, is in *value_ptr.
 */
int ask(const question_st &question, value_st *value_ptr, int line)
{
    amt_at_set_command("%s", question.m_command_ptr);
    const char *const name = question.m_name_ptr;
    const amt_at_trace_en trace =
        question.m_trace_name_ptr == nullptr ? amt_at_trace_en::NONE : amt_at_trace_en::TEXT;
    const int status = amt_at_exchange({name, trace, AMT_AT_OK, false, nullptr}, nullptr, line);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    value_ptr->m_status =
        amt_at_get_value(question.m_prefix_ptr, question.m_limit, value_ptr->m_text_a, &value_ptr->m_length);
    if (question.m_trace_name_ptr != nullptr) {
        const char *const head = amt_at_find(question.m_prefix_ptr);
        PUB_LOG(g_amt_handle_log, "%s head_ptr=%s", name, head == nullptr ? "(null)" : head);
        PUB_LOG(g_amt_handle_log, "%s %s=%s", name, question.m_trace_name_ptr, value_ptr->m_text_a);
    }
    if (value_ptr->m_status != PUB_ERR_NONE) {
        pub_log_error({g_amt_handle_log, name, line}, value_ptr->m_status);
    }
    return PUB_ERR_NONE;
}

/* The whole of a handler, told from the place of its call. */
int serve(const question_st &question, uint32_t channel, const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr,
          const pub_log_place_st &place = g_amt_handle_log)
{
    if (const int status = amt_reply_enter_modem(place, channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    value_st value = {};
    int status = ask(question, &value, place.m_line);
    if (status == PUB_ERR_NONE && (value.m_status == PUB_ERR_NONE || question.m_is_put_when_bad)) {
        amt_reply_start(rsp_ptr, question.m_rsp_id);
        status = question.m_put(rsp_ptr->m_buf_a, &value);
    }
    if (status != PUB_ERR_NONE || value.m_status != PUB_ERR_NONE) {
        return amt_reply_fail(channel, rsp_ptr, question.m_rsp_id);
    }
    return question.m_has_result ? amt_reply_finish_ok(channel, rsp_ptr) : amt_reply_finish(channel, rsp_ptr);
}

} // namespace

int amt_modem_handle_read_board(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(g_board_question, channel, req_ptr, rsp_ptr);
}

int amt_modem_handle_read_outdate(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(g_outdate_question, channel, req_ptr, rsp_ptr);
}

int amt_read_serial_number(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(g_serial_question, channel, req_ptr, rsp_ptr);
}

int amt_query_amt_support(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(g_support_question, channel, req_ptr, rsp_ptr);
}

int amt_dtoc_checkSIM(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(g_sim_question, channel, req_ptr, rsp_ptr);
}

int amt_modem_handle_temperature(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_at_clear();
    pub_file_st file(TEMPERATURE_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        pub_log_fail(g_amt_handle_log, PUB_ERR_FILE, "fopen error: errno=%d", errno);
        return amt_reply_fail(channel, rsp_ptr, AMT_TEMPERATURE_RSPCMD);
    }
    uint32_t temperature = 0;
    const int count = pub_file_scan_unsigned(file, &temperature);
    /* Before the answer, which may have to wait for its reader. */
    pub_file_close(&file);
    if (count != 1) {
        pub_log_fail(g_amt_handle_log, PUB_ERR_FILE, "fscanf error: errno=%d", errno);
        return amt_reply_fail(channel, rsp_ptr, AMT_TEMPERATURE_RSPCMD);
    }
    PUB_LOG(g_amt_handle_log, "Battery temperature: %u", temperature);
    amt_reply_start(rsp_ptr, AMT_TEMPERATURE_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_TEMPERATURE, static_cast<int32_t>(temperature));
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_channel_switch(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    constexpr uint32_t text_size = 100;
    /* Exactly this much is sent: a channel of one digit with its carriage return, a longer one without. */
    constexpr uint32_t command_length = 12;

    pub_log_entry(g_amt_handle_log);
    if (const int status = amt_reply_check_modem(g_amt_handle_log); status != PUB_ERR_NONE) {
        return status;
    }
    amt_reply_start(rsp_ptr, AMT_SWITCH_CHANNEL_RSPCMD);
    char text_a[text_size + 1] = {};
    snprintf(text_a, sizeof(text_a), "AT^DMPCHN=%" PRId32 "\r",
             amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_MODEM_CHANNEL));
    if (const int status = write_at(text_a, command_length); status != PUB_ERR_NONE) {
        return pub_log_error(g_amt_handle_log, status);
    }
    memset(text_a, 0, sizeof(text_a));
    int32_t count = 0;
    if (const int status = read_at(text_a, text_size, &count); status != PUB_ERR_NONE) {
        return pub_log_error(g_amt_handle_log, status);
    }
    if (memmem(text_a, text_size, "OK", strlen("OK")) == nullptr) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "%s", text_a);
    }
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_at_to_modem(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    if (amt_packet_get_cmd(req_ptr->m_buf_a) != AMT_SWITCH_CHANNEL_CMD) {
        return PUB_ERR_NONE;
    }
    return amt_channel_switch(channel, req_ptr, rsp_ptr);
}
