#include <errno.h>
#include <stdio.h>
#include <string.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/bluetooth.h"
#include "amt/amt-device/command.h"
#include "amt/amt-device/device-fail.h"
#include "amt/amt-device/device-text.h"
#include "amt/amt-device/radio-step.h"
#include "amt/amt-handle/channel/response.h"
#include "amt/amt-handle/request/factory-file.h"
#include "amt/amt-handle/request/request-frame.h"
#include "amt/amt-packet.h"
#include "platform/include/ldt.h"
#include "pub/error.h"

namespace {

#define BT_FOLDER "/amt/BT"

constexpr char ADDRESS_FILE[] = BT_FOLDER "/BT_Address.txt";
constexpr char PROTECT_COMMAND[] = "chmod -R 555 " BT_FOLDER;
constexpr char HANDLER[] = "amt_device_bt_address";

constexpr int32_t OPERATION_READ = 1;
constexpr int32_t OPERATION_WRITE = 2;
constexpr int32_t OPERATION_CHECK = 3;

/* The longest address and its terminating zero. */
constexpr uint32_t ADDRESS_SIZE = 60;
#define ADDRESS_WORD_FORMAT "%59s"

constexpr amt_radio_step_st CHECK_STEP = {&g_amt_device_log, HANDLER, "BT hardware check", "ldt_btCheck"};

int fail_open(const amt_device_place_st &place = {HANDLER})
{
    return amt_device_fail(place, PUB_ERR_FILE, "open(\"%s\") fail: %d - %s", ADDRESS_FILE, errno,
                           strerror(errno));
}

int read_address(amt_buf_st *rsp_ptr)
{
    FILE *stream = fopen(ADDRESS_FILE, "re");
    if (stream == nullptr) {
        fail_open();
        /* On purpose: a missing file is reported as a bad request. */
        return PUB_ERR_PARAM;
    }
    char address_a[ADDRESS_SIZE] = {};
    /* An empty file is no error of the system; an older errno would mislead. */
    errno = 0;
    const int count = fscanf(stream, ADDRESS_WORD_FORMAT, address_a);
    fclose(stream);
    if (count != 1) {
        return amt_device_fail({HANDLER}, PUB_ERR_FAIL, "read not completed");
    }
    PUB_LOG(g_amt_device_log, "read BT address: %s", address_a);
    amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_BT_ADDRESS, address_a);
    return PUB_ERR_NONE;
}

/* The lines and the status of a written file. */
int finish_write(amt_factory_step_en step, bool is_address, const char *address)
{
    if (!is_address) {
        return amt_device_fail({HANDLER}, PUB_ERR_PARAM, "unknown BT address");
    }
    if (step != amt_factory_step_en::DONE) {
        return amt_device_fail({HANDLER}, PUB_ERR_FILE, "fputs() fail");
    }
    PUB_LOG(g_amt_device_log, "write BT address: %s", address);
    amt_device_run(PROTECT_COMMAND);
    PUB_LOG(g_amt_device_log, "path = %s change to chmod -R 555", BT_FOLDER);
    return PUB_ERR_NONE;
}

/* The file is opened, and so emptied, also when there is no address to write. */
int write_address(const amt_buf_st *req_ptr)
{
    char address_a[ADDRESS_SIZE];
    const uint32_t length = amt_device_get_text(req_ptr, AMT_ATOM_BT_ADDRESS, address_a, sizeof(address_a));
    const bool is_address = length != 0 && length == strlen(address_a);
    const amt_factory_step_en step =
        amt_factory_file_put(ADDRESS_FILE, is_address ? address_a : "", is_address ? "\n" : "");
    if (step == amt_factory_step_en::OPEN_FAILED) {
        return fail_open();
    }
    const int result = finish_write(step, is_address, address_a);
    amt_factory_file_sync();
    return result;
}

int check_hardware()
{
    amt_radio_step_start(CHECK_STEP);
    const int32_t result = ldt_btCheck();
    return amt_radio_step_end(CHECK_STEP, result);
}

int operate(int32_t operation, const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    switch (operation) {
    case OPERATION_READ:
        return read_address(rsp_ptr);
    case OPERATION_WRITE:
        return write_address(req_ptr);
    case OPERATION_CHECK:
        return check_hardware();
    default:
        return amt_device_fail({HANDLER}, PUB_ERR_PARAM, "unknown operation: %d", operation);
    }
}

} // namespace

int amt_device_bt_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_device_log);
    if (AMT_CHECK_REQUEST(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_BLUETOOTH_ADDRESS_RSPCMD);
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_BT_OPERATION);
    PUB_LOG(g_amt_device_log, "amt_device_bt_address op_type:%d", operation);
    const int result = operate(operation, req_ptr, rsp_ptr);
    if (result != PUB_ERR_NONE) {
        return result;
    }
    return amt_reply_finish_ok(channel, rsp_ptr);
}
