#include "amt/amt-device/channel-request.h"

#include "amt/amt-atom.h"
#include "amt/amt-handle/channel/response.h"
#include "amt/amt-handle/request/modem-value.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

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
