#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/command.h"
#include "amt/amt-device/device-fail.h"
#include "amt/amt-device/device-text.h"
#include "amt/amt-device/radio-step.h"
#include "amt/amt-device/wifi.h"
#include "amt/amt-handle/channel/response.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-handle/request/request-frame.h"
#include "amt/amt-packet.h"
#include "platform/include/ldt.h"
#include "pub/error.h"

namespace {

#define WIFI_FOLDER "/amt/WIFI"

constexpr char PROTECT_COMMAND[] = "chmod -R 555 " WIFI_FOLDER;
constexpr char HANDLER[] = "amt_device_wifi_address";

constexpr int32_t OPERATION_READ = 0;
constexpr int32_t OPERATION_WRITE = 1;
constexpr int32_t OPERATION_CHECK = 2;

/* The longest address and its terminating zero. */
constexpr uint32_t ADDRESS_SIZE = 60;

/* The line of a failed check names the Bluetooth call; so it is known. */
constexpr amt_radio_step_st CHECK_STEP = {&g_amt_device_log, HANDLER, "wifi connectivity check",
                                          "ldt_btCtrl"};

int read_address(amt_buf_st *rsp_ptr)
{
    char address_a[ADDRESS_SIZE] = {};
    if (amt_read_wifi_address(address_a) != PUB_ERR_NONE) {
        return amt_device_fail({HANDLER}, PUB_ERR_FAIL, "read error");
    }
    PUB_LOG(g_amt_device_log, "read WIFI address: %s", address_a);
    amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_WIFI_ADDRESS, address_a);
    return PUB_ERR_NONE;
}

int write_address(const amt_buf_st *req_ptr)
{
    char address_a[ADDRESS_SIZE];
    amt_device_get_text(req_ptr, AMT_ATOM_WIFI_ADDRESS, address_a, sizeof(address_a));
    if (amt_write_wifi_address(address_a) != PUB_ERR_NONE) {
        return amt_device_fail({HANDLER}, PUB_ERR_FAIL, "write error");
    }
    PUB_LOG(g_amt_device_log, "Write WIFI address: %s", address_a);
    amt_device_run(PROTECT_COMMAND);
    PUB_LOG(g_amt_device_log, "path = %s change to chmod -R 555", WIFI_FOLDER);
    return PUB_ERR_NONE;
}

int check_connectivity()
{
    amt_radio_step_start(CHECK_STEP);
    const int32_t result = ldt_wifiCheck();
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
        return check_connectivity();
    default:
        return amt_device_fail({HANDLER}, PUB_ERR_PARAM, "unknown operation: %d", operation);
    }
}

} // namespace

int amt_device_wifi_address(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_device_log);
    if (AMT_CHECK_REQUEST(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_WIFI_TEST_RSPCMD);
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_WIFI_OPERATION);
    PUB_LOG(g_amt_device_log, "amt_device_wifi_address op_type:%d", operation);
    const int result = operate(operation, req_ptr, rsp_ptr);
    if (result != PUB_ERR_NONE) {
        return result;
    }
    return amt_reply_finish_ok(channel, rsp_ptr);
}
