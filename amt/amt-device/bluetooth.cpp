#include <unistd.h>

#include "amt/amt-command.h"
#include "amt/amt-device/child-reaper.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-device/radio-step.h"
#include "amt/amt-handle/channel/reply.h"
#include "platform/include/ldt.h"
#include "pub/error.h"

namespace {

constexpr char HANDLER[] = "amt_device_bt";
constexpr char START_FAILED_TEXT[] = "error to exec: hciattach";
constexpr amt_radio_step_st START_STEP = {&g_amt_device_log, HANDLER, "BT-start", "ldt_btCtrl"};

/*
 * The child's share. It shares with the service, through its descriptors, the very same open lines: what it
 * answers goes out on the station's line, and reading from there would take the service's bytes. Its memory
 * is a copy made at the fork (buffers, handshake state, the radio flags), so nothing it sets reaches the
 * service; of the threads it has only this one, and timers it has none. Signal handlers are the service's.
 * Properties, files and the log are shared by name as between any two processes.
 */
int switch_on_in_child(uint32_t channel, amt_buf_st *rsp_ptr)
{
    amt_radio_step_start(START_STEP);
    const int32_t answer = ldt_btCtrl(1);
    if (amt_radio_step_end(START_STEP, answer) != PUB_ERR_NONE) {
        return pub_log_fail({g_amt_device_log, HANDLER}, PUB_ERR_FILE, START_FAILED_TEXT);
    }
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_BLUETOOTH_RSPCMD);
}

} // namespace

int amt_device_bt(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const pid_t service_pid = getpid();
    const pid_t child_pid = fork();
    if (child_pid < 0) {
        return pub_log_fail({g_amt_device_log, HANDLER}, PUB_ERR_FILE, START_FAILED_TEXT);
    }
    if (child_pid == 0) {
        amt_child_die_with(service_pid);
        return switch_on_in_child(channel, rsp_ptr);
    }
    const int status = amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_BLUETOOTH_RSPCMD);
    amt_child_reap(child_pid);
    return status;
}
