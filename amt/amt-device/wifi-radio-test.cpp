#include <stdio.h>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-device/embed/embedded-data.h"
#include "amt/amt-device/radio-step.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "platform/include/ldt.h"
#include "pub/error.h"
#include "pub/util/process.h"

namespace {

#define TRACE_FILE "/data/local/wifi/wifi_dbg_file.txt"

constexpr char HANDLER[] = "amt_device_wifi_rtx_test";
constexpr uint32_t COMMAND_SIZE = 100;

constexpr amt_radio_step_st START_STEP = {&g_amt_device_log, HANDLER, "WIFI-start", "ldt_wifiCtrl"};
constexpr amt_radio_step_st STOP_STEP = {&g_amt_device_log, HANDLER, "WIFI-stop", "ldt_wifiCtrl"};
constexpr amt_radio_step_st TX_START_STEP = {&g_amt_device_log, HANDLER, "WIFI-TX-start", "ldt_TxTest"};
constexpr amt_radio_step_st TX_STOP_STEP = {&g_amt_device_log, HANDLER, "WIFI-TX-stop", "ldt_TxTest"};
constexpr amt_radio_step_st RX_START_STEP = {&g_amt_device_log, HANDLER, "WIFI-RX-start", "ldt_RxTest"};
constexpr amt_radio_step_st RX_STOP_STEP = {&g_amt_device_log, HANDLER, "WIFI-RX-stop", "ldt_RxTest"};

/* The script is linked into the image through this, though nothing follows it. */
[[gnu::used]] const char *const g_script_ptr = g_wifi_radio_test_script_a;

/* What outlasts a request; only the reader thread that serves requests uses it. */
bool g_wifi_is_running = false;
uint8_t g_wifi_rx_channel = 0;

/* A number of the request, little-endian, of 1 or 2 bytes. A missing one fails with the text. */
int get_number(const amt_buf_st *req_ptr, uint8_t atom_id, uint32_t size, uint16_t *value_ptr,
               const char *missing_text, const pub_log_place_st &place = {g_amt_device_log, HANDLER})
{
    uint8_t byte_a[2] = {};
    if (amt_packet_get_bytes(req_ptr->m_buf_a, atom_id, byte_a, size) == 0) {
        return pub_log_fail(place, PUB_ERR_FAIL, "%s", missing_text);
    }
    *value_ptr = static_cast<uint16_t>(byte_a[0] | byte_a[1] << 8);
    return PUB_ERR_NONE;
}

int start_wifi(const amt_buf_st *, amt_buf_st *)
{
    if (g_wifi_is_running) {
        return PUB_ERR_NONE;
    }
    amt_radio_step_start(START_STEP);
    const int status = amt_radio_step_end(START_STEP, ldt_wifiCtrl(1));
    g_wifi_is_running = status == PUB_ERR_NONE;
    return status;
}

int stop_wifi(const amt_buf_st *, amt_buf_st *)
{
    if (!g_wifi_is_running) {
        return PUB_ERR_NONE;
    }
    amt_radio_step_start(STOP_STEP);
    const int status = amt_radio_step_end(STOP_STEP, ldt_wifiCtrl(0));
    g_wifi_is_running = status != PUB_ERR_NONE;
    return status;
}

int start_tx(const amt_buf_st *req_ptr, amt_buf_st *)
{
    uint16_t channel = 0;
    uint16_t rate = 0;
    uint16_t power = 0;
    if (get_number(req_ptr, AMT_ATOM_WIFI_CHANNEL, 1, &channel, "Tx get channel error") != PUB_ERR_NONE ||
        get_number(req_ptr, AMT_ATOM_WIFI_RATE, 2, &rate, "Tx get rate error") != PUB_ERR_NONE ||
        get_number(req_ptr, AMT_ATOM_WIFI_POWER, 2, &power, "Tx get power error") != PUB_ERR_NONE)
    {
        return PUB_ERR_FAIL;
    }
    PUB_LOG(g_amt_device_log, "WIFI-TX-start start. channel:%d; power:%d; rate:%d", channel, power, rate);
    return amt_radio_step_end(TX_START_STEP, ldt_TxTest(1, power, rate, channel));
}

int stop_tx(const amt_buf_st *, amt_buf_st *)
{
    PUB_LOG(g_amt_device_log, "WIFI-TX-stop start. ");
    return amt_radio_step_end(TX_STOP_STEP, ldt_TxTest(0, 0, 0, 0));
}

int start_rx(const amt_buf_st *req_ptr, amt_buf_st *)
{
    uint16_t channel = 0;
    uint16_t rate = 0;
    if (get_number(req_ptr, AMT_ATOM_WIFI_CHANNEL, 1, &channel, "Rx get channel error") != PUB_ERR_NONE ||
        get_number(req_ptr, AMT_ATOM_WIFI_RATE, 2, &rate, "Rx get rate error") != PUB_ERR_NONE)
    {
        return PUB_ERR_FAIL;
    }
    PUB_LOG(g_amt_device_log, "WIFI-RX-start start. channel:%d; rate:%d", channel, rate);
    const int status = amt_radio_step_end(RX_START_STEP, ldt_RxTest(1, channel, rate, nullptr));
    if (status == PUB_ERR_NONE) {
        g_wifi_rx_channel = static_cast<uint8_t>(channel);
    }
    return status;
}

/* Stops on the channel of the last start, whatever the request says. */
int stop_rx(const amt_buf_st *, amt_buf_st *rsp_ptr)
{
    int32_t count = 0;
    PUB_LOG(g_amt_device_log, "WIFI-RX-stop start. channel:%d", g_wifi_rx_channel);
    const int32_t stopped = ldt_RxTest(0, g_wifi_rx_channel, 0, &count);
    PUB_LOG(g_amt_device_log, "WIFI-RX-stop end. return:%d; cnt:%d.", stopped, count);
    const int status = amt_radio_step_check(RX_STOP_STEP, stopped);
    if (status == PUB_ERR_NONE) {
        amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_WIFI_PACKET_COUNT, count);
    }
    return status;
}

struct sub_command_st
{
    bool m_needs_wifi;
    int (*m_func)(const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);
};

/* Sub-command 1 is the first row. */
constexpr sub_command_st SUB_COMMAND_A[] = {
    {false, start_wifi}, {false, stop_wifi}, {true, start_tx},
    {true, stop_tx},     {true, start_rx},   {true, stop_rx},
};
constexpr uint8_t SUB_COMMAND_MAX = sizeof(SUB_COMMAND_A) / sizeof(SUB_COMMAND_A[0]);

int operate(uint8_t sub_command, const amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (sub_command == 0 || sub_command > SUB_COMMAND_MAX) {
        pub_log_fail({g_amt_device_log, HANDLER}, PUB_ERR_PARAM, "unknown operation: %u", sub_command);
        pub_util_run_shell("echo the subcmd is invalid >> " TRACE_FILE);
        return PUB_ERR_PARAM;
    }
    const sub_command_st &row = SUB_COMMAND_A[sub_command - 1];
    if (row.m_needs_wifi && !g_wifi_is_running) {
        return pub_log_fail({g_amt_device_log, HANDLER}, PUB_ERR_FAIL, "WIFI is not running");
    }
    return row.m_func(req_ptr, rsp_ptr);
}

/* The command text begins with a blank. */
void trace_sub_command(uint8_t sub_command)
{
    char command_a[COMMAND_SIZE];
    snprintf(command_a, sizeof(command_a), " echo the cmd value received from pc is : %u >> " TRACE_FILE,
             sub_command);
    pub_util_run_shell(command_a);
}

} // namespace

int amt_device_wifi_rtx_test(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    amt_reply_start(rsp_ptr, AMT_WIFI_RTX_TEST_RSPCMD);
    uint8_t sub_command = 0;
    amt_packet_get_bytes(req_ptr->m_buf_a, AMT_ATOM_WIFI_SUB_COMMAND, &sub_command, sizeof(sub_command));
    trace_sub_command(sub_command);
    amt_packet_add_bytes(rsp_ptr->m_buf_a, AMT_ATOM_WIFI_SUB_COMMAND, &sub_command, sizeof(sub_command));
    const int status = operate(sub_command, req_ptr, rsp_ptr);
    return status == PUB_ERR_NONE ? amt_reply_finish_ok(channel, rsp_ptr) : status;
}
