#include "amt/amt-handle/request/modem-value.h"

#include <inttypes.h>
#include <stdio.h>
#include <string.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/channel/at-io.h"
#include "amt/amt-handle/request/request-frame.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "pub/file/scan.h"

namespace {

constexpr uint8_t ATOM_TEMPERATURE = 22;
constexpr uint8_t ATOM_OUTDATE = 27;
constexpr uint8_t ATOM_BOARD = 38;
constexpr uint8_t ATOM_CHANNEL = 159;
constexpr uint8_t RSP_CHANNEL_SWITCH = 233;

constexpr const char *TEMPERATURE_HANDLER = "amt_modem_handle_temperature";

/* Relative to the working directory, which is the root directory in service. */
constexpr const char *TEMPERATURE_FILE = "sys/class/power_supply/battery/temp";

constexpr uint32_t VALUE_LIMIT_MAX = 38;

/* A text that the modem keeps, and the response it goes into. */
struct text_request_st
{
    amt_at_exchange_st m_exchange;
    const char *m_command_ptr;
    const char *m_prefix_ptr;
    uint32_t m_limit;   /* characters, at most VALUE_LIMIT_MAX */
    bool m_is_erasable; /* a value that begins with 0xFF was never written */
    uint8_t m_rsp_id;
    uint8_t m_atom;
};

constexpr text_request_st g_board_request = {
    {"amt_modem_handle_read_board", amt_at_trace_en::NONE, AMT_AT_OK, false, nullptr},
    "AT^DMSN\r",
    "\r\n^DMSN:",
    38,
    false,
    AMT_READ_BOARD_RSPCMD,
    ATOM_BOARD};
constexpr text_request_st g_outdate_request = {
    {"amt_modem_handle_read_outdate", amt_at_trace_en::NONE, AMT_AT_OK, false, nullptr},
    "AT^DMFD?\?\r",
    "\r\n^DMFD:",
    14,
    true,
    AMT_READ_OUTDATE_RSPCMD,
    ATOM_OUTDATE};

/* Asks the modem for the text; -100 when its answer has none that can be passed on. */
int ask_text(const text_request_st &request, char *value)
{
    amt_at_set_command("%s", request.m_command_ptr);
    if (const int status = amt_at_exchange(request.m_exchange, nullptr); status != PUB_ERR_NONE) {
        return status;
    }
    uint32_t length = 0;
    int status = amt_at_get_value(request.m_prefix_ptr, request.m_limit, value, &length);
    if (request.m_is_erasable && value[0] == '\xFF') {
        status = PUB_ERR_FAIL;
    }
    if (status != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, status, request.m_exchange.m_name_ptr);
    }
    return status;
}

int answer_text(const text_request_st &request, uint32_t channel, amt_buf_st *rsp_ptr)
{
    char value_a[VALUE_LIMIT_MAX + 1];
    if (ask_text(request, value_a) != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, request.m_rsp_id);
    }
    amt_reply_start(rsp_ptr, request.m_rsp_id);
    amt_packet_add_string(rsp_ptr->m_buf_a, request.m_atom, value_a);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

/* Reads the battery driver's number. Returns 0 or -118, errno being the failing call's. */
int read_temperature(uint32_t *temperature_ptr)
{
    const pub_file_st file(TEMPERATURE_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        pub_log_error(g_amt_handle_log, PUB_ERR_FILE, TEMPERATURE_HANDLER);
        PUB_LOG(g_amt_handle_log, "fopen error: errno=%d", errno);
        return PUB_ERR_FILE;
    }
    if (pub_file_scan_unsigned(file, temperature_ptr) != 1) {
        pub_log_error(g_amt_handle_log, PUB_ERR_FILE, TEMPERATURE_HANDLER);
        PUB_LOG(g_amt_handle_log, "fscanf error: errno=%d", errno);
        return PUB_ERR_FILE;
    }
    return PUB_ERR_NONE;
}

} // namespace

int amt_modem_handle_read_board(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (const int status = AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    return answer_text(g_board_request, channel, rsp_ptr);
}

int amt_modem_handle_read_outdate(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (const int status = AMT_BEGIN_MODEM_REQUEST(channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    return answer_text(g_outdate_request, channel, rsp_ptr);
}

int amt_modem_handle_temperature(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (const int status = AMT_BEGIN_REQUEST(channel, req_ptr, rsp_ptr); status != PUB_ERR_NONE) {
        return status;
    }
    amt_at_clear();
    uint32_t temperature = 0;
    if (read_temperature(&temperature) != PUB_ERR_NONE) {
        return amt_reply_failed(channel, rsp_ptr, AMT_TEMPERATURE_RSPCMD);
    }
    PUB_LOG(g_amt_handle_log, "Battery temperature: %u", temperature);
    amt_reply_start(rsp_ptr, AMT_TEMPERATURE_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, ATOM_TEMPERATURE, static_cast<int32_t>(temperature));
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_channel_switch(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    constexpr uint32_t text_size = 100;
    /* Exactly this much is sent: a channel of one digit with its carriage return, a longer one without. */
    constexpr uint32_t command_length = 12;

    pub_log_entry(g_amt_handle_log);
    if (const int status = amt_handle_check_modem(); status != PUB_ERR_NONE) {
        return status;
    }
    amt_reply_start(rsp_ptr, RSP_CHANNEL_SWITCH);
    char text_a[text_size + 1] = {};
    snprintf(text_a, sizeof(text_a), "AT^DMPCHN=%" PRId32 "\r",
             amt_packet_get_int(req_ptr->m_buf_a, ATOM_CHANNEL));
    if (const int status = write_at(text_a, command_length); status != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, status);
        return status;
    }
    memset(text_a, 0, sizeof(text_a));
    int32_t count = 0;
    if (const int status = read_at(text_a, text_size, &count); status != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, status);
        return status;
    }
    if (memmem(text_a, text_size, "OK", strlen("OK")) == nullptr) {
        pub_log_error(g_amt_handle_log, PUB_ERR_FAIL);
        PUB_LOG(g_amt_handle_log, "%s", text_a);
        return PUB_ERR_FAIL;
    }
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_at_to_modem(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_device_log);
    if (AMT_CHECK_REQUEST(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    if (amt_packet_get_cmd(req_ptr->m_buf_a) != AMT_SWITCH_CHANNEL_CMD) {
        return PUB_ERR_NONE;
    }
    return amt_channel_switch(channel, req_ptr, rsp_ptr);
}
