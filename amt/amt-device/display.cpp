#include "amt/amt-device/display.h"

#include "amt/amt-command.h"
#include "amt/amt-handle/channel/response.h"
#include "pub/error.h"

int amt_device_lcd_color(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_device_log);
    if (AMT_CHECK_REQUEST(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_SHOWLCD_RSPCMD);
}
