#include "amt/amt-handle/reader/pc-handshake.h"

#include <pthread.h>
#include <string.h>

#include "amt/amt-device/handshake-picture.h"
#include "amt/amt-device/test-hal.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/handshake.h"
#include "amt/amt-log.h"

namespace {

void note_first_data()
{
    if (g_handshake_state.m_is_ready.exchange(1) == 0) {
        amt_timer_delete(&g_handshake_state.m_usb_enum_timer);
    }
}

bool is_waited_for()
{
    return g_handshake_state.m_is_ready != 0 && g_handshake_state.m_is_done == 0 &&
           g_handshake_state.m_handshake_timer.m_id != -1;
}

void start_picture()
{
    pthread_attr_t attr;
    pthread_attr_init(&attr);
    pthread_attr_setdetachstate(&attr, PTHREAD_CREATE_DETACHED);
    pthread_t id = 0;
    const int error = pthread_create(&id, &attr, amt_handle_load_image_for_handshake, nullptr);
    pthread_attr_destroy(&attr);
    if (error != 0) {
        PUB_LOG(g_amt_handle_log, "pthread_create() amt_handle_load_image_for_handshake: %d - %s", error,
                strerror(error));
        return;
    }
    PUB_LOG(g_amt_handle_log, "pthread_create() amt_handle_load_image_for_handshake success.");
}

void set_usb_charging()
{
    const int mode = g_handle_state.m_amt_mode;
    const int charge_mode = mode == AMT_MODE_4 ? 1 : 0;
    const int status = amt_usb_charge_ctrl(charge_mode);
    PUB_LOG(g_amt_handle_log, "call amt_usb_charge_ctrl. return:%d, current amt mode:%d, usb_charge_mode:%d.",
            status, mode, charge_mode);
}

} // namespace

void amt_pc_handshake_on_data()
{
    if (g_usb_activate == 0) {
        return;
    }
    note_first_data();
    if (!is_waited_for()) {
        return;
    }
    g_handshake_state.m_is_done = 1;
    amt_timer_delete(&g_handshake_state.m_handshake_timer);
    PUB_LOG(g_amt_handle_log, "handshake success.");
    start_picture();
    set_usb_charging();
}
