#include "amt/amt-handle/request/identity-request.h"

#include <errno.h>
#include <stdio.h>

#include "amt/amt-command.h"
#include "amt/amt-handle/channel/response.h"
#include "amt/amt-handle/request/factory-file.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

static constexpr uint8_t PCBA_ATOM_OPERATION = 190;
static constexpr uint8_t PCBA_ATOM_SN = 191;
static constexpr uint8_t PCBA_READ = 1;
static constexpr uint8_t PCBA_WRITE = 2;

static constexpr uint8_t ADB_RSP_ID = 192;
static constexpr uint8_t ADB_ATOM_OPERATION = 160;
static constexpr uint8_t ADB_ATOM_SERIAL = 161;
static constexpr uint8_t ADB_ATOM_LENGTH = 162;
static constexpr int32_t ADB_READ = 0;
static constexpr int32_t ADB_WRITE = 1;
static constexpr int32_t ADB_LENGTH_MAX = 99;
static constexpr const char *ADB_FILE = "/amt/usb_serial";

/* The last lines of a failed request: they name the handler, not the step that failed. */
static int fail_request(int line, const char *func, const char *text)
{
    pub_log_error(g_amt_handle_log, PUB_ERR_FAIL, func, line);
    PUB_LOG(g_amt_handle_log, "%s", text);
    return PUB_ERR_FAIL;
}

/* The result 0 is the last atom of either response. */
static int send_result(uint32_t channel, amt_buf_st *rsp_ptr)
{
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    return amt_handle_finish_rsp(channel, rsp_ptr);
}

int amt_handle_board_pcba_ctrl(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_handle_log);
    if (AMT_CHECK_REQUEST(g_amt_handle_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_packet_init(rsp_ptr->m_buf_a, AMT_BOARD_PCBA_CTRL_RSPCMD);
    uint8_t operation = 0;
    amt_packet_get_bytes(req_ptr->m_buf_a, PCBA_ATOM_OPERATION, &operation, sizeof(operation));
    PUB_LOG(g_amt_handle_log, "pcba op-type: %d.", operation);

    char sn_a[AMT_PCBA_SN_SIZE] = {};
    switch (operation) {
    case PCBA_READ:
        if (amt_read_pcba_sn(sn_a) != PUB_ERR_NONE) {
            return fail_request(__LINE__, __func__, "read error.");
        }
        PUB_LOG(g_amt_handle_log, "readed pcba-sn: %s.", sn_a);
        amt_packet_add_string(rsp_ptr->m_buf_a, PCBA_ATOM_SN, sn_a);
        break;
    case PCBA_WRITE:
        amt_packet_get_string(req_ptr->m_buf_a, PCBA_ATOM_SN, sn_a, sizeof(sn_a));
        sn_a[sizeof(sn_a) - 1] = '\0'; /* a text of exactly this size comes without its terminator */
        PUB_LOG(g_amt_handle_log, "getted pcba-sn: %s.", sn_a);
        if (amt_write_pcba_sn(sn_a, AMT_PCBA_SN_FILE) != PUB_ERR_NONE) {
            return fail_request(__LINE__, __func__, "write error.");
        }
        PUB_LOG(g_amt_handle_log, "Writed to file success.pcba-sn: %s.", sn_a);
        break;
    default:
        pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
        PUB_LOG(g_amt_handle_log, "unknown operation type: %u", operation);
        return PUB_ERR_PARAM;
    }
    return send_result(channel, rsp_ptr);
}

/* Reads the first word of the file, for the handler of that name, and adds it to the response. */
static int read_adb_serial(const char *func, amt_buf_st *rsp_ptr)
{
    FILE *const stream = fopen(ADB_FILE, "r");
    if (stream == nullptr) {
        return fail_request(__LINE__, func, "fopen error");
    }
    char serial_a[ADB_LENGTH_MAX + 1] = {};
    static_assert(sizeof(serial_a) == 100, "the width below is one less");
    errno = 0;
    int ret_val = PUB_ERR_NONE;
    if (fscanf(stream, "%99s", serial_a) == 1) {
        PUB_LOG(g_amt_handle_log, "read adb serial no. ok, it is : %s", serial_a);
        amt_packet_add_string(rsp_ptr->m_buf_a, ADB_ATOM_SERIAL, serial_a);
    } else {
        ret_val = fail_request(__LINE__, func, "fscanf error");
    }
    fclose(stream);
    return ret_val;
}

static int write_adb_serial(const char *func, const amt_buf_st *req_ptr)
{
    const int32_t length = amt_packet_get_int(req_ptr->m_buf_a, ADB_ATOM_LENGTH);
    if (length < 1 || length > ADB_LENGTH_MAX) {
        return fail_request(__LINE__, func, "Invalid adb serial number length!");
    }
    char serial_a[ADB_LENGTH_MAX + 1] = {};
    const uint32_t capacity = static_cast<uint32_t>(length) + 1;
    amt_packet_get_string(req_ptr->m_buf_a, ADB_ATOM_SERIAL, serial_a, capacity);
    serial_a[length] = '\0';

    int ret_val = PUB_ERR_NONE;
    const amt_factory_step_en step = amt_factory_file_put(ADB_FILE, serial_a);
    if (step == amt_factory_step_en::OPEN_FAILED) {
        return fail_request(__LINE__, func, "fopen error");
    }
    PUB_LOG(g_amt_handle_log, "open file \"%s\" ok", ADB_FILE);
    if (step == amt_factory_step_en::WRITE_FAILED) {
        ret_val = fail_request(__LINE__, func, "fprintf error");
    } else {
        PUB_LOG(g_amt_handle_log, "write adb serial no.[%s] ok", serial_a);
    }
    amt_factory_file_sync();
    return ret_val;
}

int amt_handle_adb_serial_no(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_handle_log);
    if (AMT_CHECK_REQUEST(g_amt_handle_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_packet_init(rsp_ptr->m_buf_a, ADB_RSP_ID);
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, ADB_ATOM_OPERATION);
    int ret_val = PUB_ERR_PARAM;
    switch (operation) {
    case ADB_READ:
        ret_val = read_adb_serial(__func__, rsp_ptr);
        break;
    case ADB_WRITE:
        ret_val = write_adb_serial(__func__, req_ptr);
        break;
    default:
        pub_log_error(g_amt_handle_log, ret_val);
        PUB_LOG(g_amt_handle_log, "unknown operation: %d", operation);
        break;
    }
    return ret_val == PUB_ERR_NONE ? send_result(channel, rsp_ptr) : ret_val;
}
