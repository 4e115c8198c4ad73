#include "amt/amt-device/radio-address.h"

#include <stdio.h>
#include <string.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-device/radio-step.h"
#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-packet.h"
#include "platform/include/ldt.h"
#include "pub/error.h"
#include "pub/file/file.h"
#include "pub/util/process.h"

namespace {

constexpr char BT_HANDLER[] = "amt_device_bt_address";
constexpr char WIFI_HANDLER[] = "amt_device_wifi_address";

static_assert(AMT_WIFI_ADDRESS_SIZE == AMT_RADIO_ADDRESS_SIZE);

constexpr uint32_t COMMAND_SIZE = 40;

/* Lets everybody read what is in the folder. */
void expose(const char *folder)
{
    char command_a[COMMAND_SIZE];
    snprintf(command_a, sizeof(command_a), "chmod -R 555 %s", folder);
    pub_util_run_shell(command_a);
    PUB_LOG(g_amt_device_log, "path = %s change to chmod -R 555", folder);
}

int read_bt_address(char *address_a)
{
    const pub_file_step_en step = pub_file_read_word(AMT_BT_ADDRESS_FILE, address_a, AMT_RADIO_ADDRESS_SIZE);
    if (step == pub_file_step_en::OPEN_FAILED) {
        amt_factory_file_fail_open(AMT_BT_ADDRESS_FILE, {g_amt_device_log, BT_HANDLER});
        /* On purpose: a missing file is reported as a bad request. */
        return PUB_ERR_PARAM;
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail({g_amt_device_log, BT_HANDLER}, PUB_ERR_FAIL, "read not completed");
    }
    PUB_LOG(g_amt_device_log, "read BT address: %s", address_a);
    return PUB_ERR_NONE;
}

/* The lines and the status of a file that has been opened. */
int finish_bt_write(bool is_address, bool is_written, const char *address)
{
    if (!is_address) {
        return pub_log_fail({g_amt_device_log, BT_HANDLER}, PUB_ERR_PARAM, "unknown BT address");
    }
    if (!is_written) {
        return pub_log_fail({g_amt_device_log, BT_HANDLER}, PUB_ERR_FILE, "fputs() fail");
    }
    PUB_LOG(g_amt_device_log, "write BT address: %s", address);
    expose("/amt/BT");
    return PUB_ERR_NONE;
}

/* The file is opened, and so emptied, also when there is no address to write. */
int write_bt_address(const char *address, uint32_t length)
{
    const bool is_address = length != 0 && length == strlen(address);
    const pub_file_step_en step =
        pub_file_write(AMT_BT_ADDRESS_FILE, is_address ? address : "", is_address ? "\n" : "");
    if (step == pub_file_step_en::OPEN_FAILED) {
        return amt_factory_file_fail_open(AMT_BT_ADDRESS_FILE, {g_amt_device_log, BT_HANDLER});
    }
    const int status = finish_bt_write(is_address, step == pub_file_step_en::DONE, address);
    amt_factory_file_sync();
    return status;
}

int read_wifi_address(char *address_a)
{
    if (amt_read_wifi_address(address_a) != PUB_ERR_NONE) {
        return pub_log_fail({g_amt_device_log, WIFI_HANDLER}, PUB_ERR_FAIL, "read error");
    }
    PUB_LOG(g_amt_device_log, "read WIFI address: %s", address_a);
    return PUB_ERR_NONE;
}

int write_wifi_address(const char *address, uint32_t)
{
    if (amt_write_wifi_address(address) != PUB_ERR_NONE) {
        return pub_log_fail({g_amt_device_log, WIFI_HANDLER}, PUB_ERR_FAIL, "write error");
    }
    PUB_LOG(g_amt_device_log, "Write WIFI address: %s", address);
    expose("/amt/WIFI");
    return PUB_ERR_NONE;
}

/* A radio whose address the station reads and writes, and which it checks: three operations in a row. */
struct radio_st
{
    uint8_t m_rsp_id;
    uint8_t m_operation_atom;
    uint8_t m_address_atom;
    int32_t m_read_operation; /* the write and the check are the next two */
    int (*m_read)(char *address_a);
    int (*m_write)(const char *address, uint32_t length);
    int32_t (*m_check)();
    amt_radio_step_st m_check_step;
};

constexpr radio_st BT_RADIO = {
    AMT_BLUETOOTH_ADDRESS_RSPCMD,
    AMT_ATOM_BT_OPERATION,
    AMT_ATOM_BT_ADDRESS,
    1,
    read_bt_address,
    write_bt_address,
    ldt_btCheck,
    {&g_amt_device_log, BT_HANDLER, "BT hardware check", "ldt_btCheck"},
};

/* The line of a failed check names a Bluetooth call: station logs are searched for this very text. */
constexpr radio_st WIFI_RADIO = {
    AMT_WIFI_TEST_RSPCMD,  AMT_ATOM_WIFI_OPERATION,
    AMT_ATOM_WIFI_ADDRESS, 0,
    read_wifi_address,     write_wifi_address,
    ldt_wifiCheck,         {&g_amt_device_log, WIFI_HANDLER, "wifi connectivity check", "ldt_btCtrl"},
};

int read_address(const radio_st &radio, amt_buf_st *rsp_ptr)
{
    char address_a[AMT_RADIO_ADDRESS_SIZE] = {};
    const int status = radio.m_read(address_a);
    if (status == PUB_ERR_NONE) {
        amt_packet_add_string(rsp_ptr->m_buf_a, radio.m_address_atom, address_a);
    }
    return status;
}

int write_address(const radio_st &radio, const amt_buf_st *req_ptr)
{
    char address_a[AMT_RADIO_ADDRESS_SIZE];
    const uint32_t length = amt_radio_address_get(req_ptr, radio.m_address_atom, address_a);
    return radio.m_write(address_a, length);
}

int check(const radio_st &radio)
{
    amt_radio_step_start(radio.m_check_step);
    return amt_radio_step_end(radio.m_check_step, radio.m_check());
}

int operate(const radio_st &radio, int32_t operation, const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    switch (int64_t{operation} - radio.m_read_operation) {
    case 0:
        return read_address(radio, rsp_ptr);
    case 1:
        return write_address(radio, req_ptr);
    case 2:
        return check(radio);
    default:
        return pub_log_fail({g_amt_device_log, radio.m_check_step.m_handler_ptr}, PUB_ERR_PARAM,
                            "unknown operation: %d", operation);
    }
}

int serve(const radio_st &radio, uint32_t channel, const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr,
          const pub_log_place_st &place = g_amt_device_log)
{
    if (amt_reply_enter(place, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, radio.m_rsp_id);
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, radio.m_operation_atom);
    PUB_LOG(g_amt_device_log, "%s op_type:%d", radio.m_check_step.m_handler_ptr, operation);
    const int status = operate(radio, operation, req_ptr, rsp_ptr);
    return status == PUB_ERR_NONE ? amt_reply_finish_ok(channel, rsp_ptr) : status;
}

} // namespace

uint32_t amt_radio_address_get(const amt_buf_st *req_ptr, uint8_t atom_id, char *address_a)
{
    constexpr uint32_t LENGTH_MAX = AMT_RADIO_ADDRESS_SIZE - 1;
    address_a[0] = '\0';
    const uint32_t taken =
        amt_packet_get_string(req_ptr->m_buf_a, atom_id, address_a, AMT_RADIO_ADDRESS_SIZE);
    if (taken <= LENGTH_MAX) {
        return taken;
    }
    /* A value of exactly the capacity comes without a terminating zero. */
    address_a[LENGTH_MAX] = '\0';
    return LENGTH_MAX;
}

int amt_device_bt_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(BT_RADIO, channel, req_ptr, rsp_ptr);
}

int amt_device_wifi_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    return serve(WIFI_RADIO, channel, req_ptr, rsp_ptr);
}
