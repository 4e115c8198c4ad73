#include "amt/amt-handle/request/identity-request.h"

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

constexpr uint8_t PCBA_READ = 1;
constexpr uint8_t PCBA_WRITE = 2;

constexpr int32_t ADB_READ = 0;
constexpr int32_t ADB_WRITE = 1;
constexpr int32_t ADB_LENGTH_MAX = 99;
constexpr const char *ADB_FILE = "/amt/usb_serial";
constexpr const char *ADB_HANDLER = "amt_handle_adb_serial_no";

/* Adds the first word of the file to the response. */
int read_adb_serial(amt_buf_st *rsp_ptr)
{
    char serial_a[ADB_LENGTH_MAX + 1];
    const pub_file_step_en step = pub_file_read_word(ADB_FILE, serial_a, sizeof(serial_a));
    if (step == pub_file_step_en::OPEN_FAILED) {
        return pub_log_fail({g_amt_handle_log, ADB_HANDLER}, PUB_ERR_FAIL, "fopen error");
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail({g_amt_handle_log, ADB_HANDLER}, PUB_ERR_FAIL, "fscanf error");
    }
    PUB_LOG(g_amt_handle_log, "read adb serial no. ok, it is : %s", serial_a);
    amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_ADB_SERIAL, serial_a);
    return PUB_ERR_NONE;
}

int write_adb_serial(const amt_buf_st *req_ptr)
{
    const int32_t length = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_ADB_LENGTH);
    if (length < 1 || length > ADB_LENGTH_MAX) {
        return pub_log_fail({g_amt_handle_log, ADB_HANDLER}, PUB_ERR_FAIL,
                            "Invalid adb serial number length!");
    }
    char serial_a[ADB_LENGTH_MAX + 1] = {};
    const uint32_t capacity = static_cast<uint32_t>(length) + 1;
    amt_packet_get_string(req_ptr->m_buf_a, AMT_ATOM_ADB_SERIAL, serial_a, capacity);
    serial_a[length] = '\0';

    const pub_file_step_en step = amt_factory_file_write(ADB_FILE, serial_a);
    if (step == pub_file_step_en::OPEN_FAILED) {
        return pub_log_fail({g_amt_handle_log, ADB_HANDLER}, PUB_ERR_FAIL, "fopen error");
    }
    PUB_LOG(g_amt_handle_log, "open file \"%s\" ok", ADB_FILE);
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail({g_amt_handle_log, ADB_HANDLER}, PUB_ERR_FAIL, "fprintf error");
    }
    PUB_LOG(g_amt_handle_log, "write adb serial no.[%s] ok", serial_a);
    return PUB_ERR_NONE;
}

} // namespace

int amt_handle_board_pcba_ctrl(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_BOARD_PCBA_CTRL_RSPCMD);
    uint8_t operation = 0;
    amt_packet_get_bytes(req_ptr->m_buf_a, AMT_ATOM_PCBA_OPERATION, &operation, sizeof(operation));
    PUB_LOG(g_amt_handle_log, "pcba op-type: %d.", operation);

    char sn_a[AMT_PCBA_SN_SIZE] = {};
    switch (operation) {
    case PCBA_READ:
        if (amt_read_pcba_sn(sn_a) != PUB_ERR_NONE) {
            return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "read error.");
        }
        PUB_LOG(g_amt_handle_log, "readed pcba-sn: %s.", sn_a);
        amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_PCBA_SN, sn_a);
        break;
    case PCBA_WRITE:
        amt_packet_get_string(req_ptr->m_buf_a, AMT_ATOM_PCBA_SN, sn_a, sizeof(sn_a));
        sn_a[sizeof(sn_a) - 1] = '\0'; /* a text of exactly this size comes without its terminator */
        PUB_LOG(g_amt_handle_log, "getted pcba-sn: %s.", sn_a);
        if (amt_write_pcba_sn(sn_a, AMT_PCBA_SN_FILE) != PUB_ERR_NONE) {
            return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "write error.");
        }
        PUB_LOG(g_amt_handle_log, "Writed to file success.pcba-sn: %s.", sn_a);
        break;
    default:
        return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "unknown operation type: %u", operation);
    }
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_handle_adb_serial_no(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_ADB_SERIAL_NO_RSPCMD);
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_ADB_OPERATION);
    if (operation != ADB_READ && operation != ADB_WRITE) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "unknown operation: %d", operation);
    }
    const int status = operation == ADB_READ ? read_adb_serial(rsp_ptr) : write_adb_serial(req_ptr);
    return status == PUB_ERR_NONE ? amt_reply_finish_ok(channel, rsp_ptr) : status;
}
