#include "amt/amt-device/vibrator.h"

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-file.h"
#include "amt/amt-handle/channel/response.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

constexpr char ENABLE_FILE[] = "/sys/class/timed_output/vibrator/enable";
constexpr int32_t RUN_MS = 3000;

} // namespace

int amt_device_vibrator(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_device_log);
    if (AMT_CHECK_REQUEST(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int32_t flag = amt_packet_get_bool(req_ptr->m_buf_a, AMT_ATOM_SWITCH);
    if (amt_device_file_write_int(ENABLE_FILE, flag != 0 ? RUN_MS : 0) != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    /* Any other value has started it too, but only 1 is called so. */
    PUB_LOG(g_amt_device_log, "%s vibrator", flag == 1 ? "start" : "stop");
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_VIBRATION_RSPCMD);
}
