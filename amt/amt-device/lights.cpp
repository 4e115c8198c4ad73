#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-file.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

/* What an operator sees or feels: display, lights, vibrator. */
namespace {

constexpr char LCD_FILE[] = "/sys/class/leds/lcd-backlight/brightness";
constexpr char BUTTON_FILE[] = "/sys/class/leds/button-backlight/brightness";
constexpr char VIBRATOR_FILE[] = "/sys/class/timed_output/vibrator/enable";

constexpr uint32_t LEVEL_MAX = 255;
constexpr int32_t LEVEL_UNKNOWN = -1;
constexpr int32_t LEVEL_DEFAULT = 200;
constexpr int32_t VIBRATION_MS = 3000;

/* The LCD level found before the first request. Only the reader thread that serves requests uses it. */
int32_t g_first_lcd_brightness = LEVEL_UNKNOWN;

/* Compared as unsigned on purpose: every negative level is out of range, the unknown one included. */
bool is_level(int32_t level)
{
    return static_cast<uint32_t>(level) <= LEVEL_MAX;
}

int32_t level_to_write(int32_t requested)
{
    if (is_level(requested)) {
        return requested;
    }
    return is_level(g_first_lcd_brightness) ? g_first_lcd_brightness : LEVEL_DEFAULT;
}

} // namespace

int amt_device_lcd_color(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_SHOWLCD_RSPCMD);
}

int amt_device_lcd_brightness(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    if (g_first_lcd_brightness < 0) {
        amt_device_file_read_int(LCD_FILE, &g_first_lcd_brightness);
    }
    const int32_t requested = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_LCD_LEVEL);
    PUB_LOG(g_amt_device_log, "amt_device_lcd_brightness lcd_brightness: %d", requested);
    PUB_LOG(g_amt_device_log, "amt_device_lcd_brightness src_lcd_brightness: %d", g_first_lcd_brightness);
    if (amt_device_file_write_int(LCD_FILE, level_to_write(requested)) == PUB_ERR_NONE) {
        amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_LCDLIGHT_RSPCMD);
    }
    return PUB_ERR_NONE;
}

int amt_device_button_backlight(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int32_t flag = amt_packet_get_bool(req_ptr->m_buf_a, AMT_ATOM_SWITCH);
    if (amt_device_file_write_int(BUTTON_FILE, flag) != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    PUB_LOG(g_amt_device_log, "%s button backlight", flag == 1 ? "open" : "close");
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_BACKLIGHT_RSPCMD);
}

int amt_device_vibrator(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int32_t flag = amt_packet_get_bool(req_ptr->m_buf_a, AMT_ATOM_SWITCH);
    if (amt_device_file_write_int(VIBRATOR_FILE, flag != 0 ? VIBRATION_MS : 0) != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    /* Any other value has started it too, but only 1 is called so. */
    PUB_LOG(g_amt_device_log, "%s vibrator", flag == 1 ? "start" : "stop");
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_VIBRATION_RSPCMD);
}
