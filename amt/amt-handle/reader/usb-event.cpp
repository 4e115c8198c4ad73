#include "amt/amt-handle/reader/usb-event.h"

#include <string.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-log.h"

namespace {

/* The first string that tells the USB state, or null. */
const char *find_usb_state(const amt_usb_event_st &event)
{
    const char *const end = event.m_text_a + event.m_length;
    for (const char *text = event.m_text_a; text < end; text += strlen(text) + 1) {
        PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop uevent:[%s] nLen:%u", text, event.m_length);
        if (strstr(text, "USB_STATE") != nullptr) {
            return text;
        }
    }
    return nullptr;
}

void note_usb_state(const char *status)
{
    PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop usb_status:[%s]", status);
    if (strstr(status, "DISCONNECTED") != nullptr) {
        g_handle_state.m_usb_state = amt_usb_en::DISCONNECTED;
        PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb disconnect event");
        amt_handshake_link_down();
        return;
    }
    if (strstr(status, "CONFIGURED") != nullptr) {
        g_handle_state.m_usb_state = amt_usb_en::CONFIGURED;
        PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb CONFIGURED event");
        amt_handshake_link_up();
        return;
    }
    g_handle_state.m_usb_state = amt_usb_en::OTHER;
    PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb other status event");
}

} // namespace

void amt_usb_event_serve(const amt_usb_event_st &event)
{
    const char *const status = find_usb_state(event);
    if (status != nullptr) {
        note_usb_state(status);
    }
}
