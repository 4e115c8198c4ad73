#include "amt/amt-handle/handshake.h"

#include <atomic>
#include <mutex>
#include <pthread.h>
#include <signal.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-device/handshake-picture.h"
#include "amt/amt-device/test-hal.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/timer.h"
#include "amt/amt-handle/request/handshake-permission.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "platform/include/cutils/properties.h"
#include "pub/error.h"
#include "pub/util/mutex.h"
#include "pub/util/thread-end.h"

namespace {

constexpr char AC_FILE[] = "/sys/class/power_supply/ac/online";
constexpr char USB_STATE_FILE[] = "/sys/class/android_usb/android0/state";
constexpr char FAILURE_PROPERTY[] = "sys.vx.amt.failure.handshake";

constexpr uint32_t FILE_TEXT_SIZE = 100;
constexpr int LINK_SECONDS = 20;
constexpr int DATA_SECONDS = 5;

/* How often the end tries, once a millisecond, to get the lock: far longer than any event holds it. */
constexpr int END_ATTEMPTS = 100;

struct handshake_st
{
    bool m_is_ready; /* the link is configured, or data has come over it */
    bool m_is_done;  /* the handshake has succeeded */
    bool m_is_over;  /* the daemon is ending: nothing begins any more */
    amt_timer_st m_link_timer;
    amt_timer_st m_data_timer;
};

pub_mutex_c g_mutex;
handshake_st g_handshake; /* under g_mutex */

std::atomic<bool> g_is_ac_power;     /* the start was refused because of AC power */
std::atomic<bool> g_is_property_set; /* once a process */

/* The end may come by a fault on the very thread that holds the lock, and then goes on without. */
bool lock_for_the_end()
{
    for (int i = 0; i < END_ATTEMPTS; i++) {
        if (g_mutex.try_lock()) {
            return true;
        }
        pub_util_sleep_ms(1);
    }
    return false;
}

bool is_armed(const amt_timer_st &timer)
{
    return timer.m_id != -1;
}

void arm(amt_timer_st *timer_ptr, amt_timer_func callback, int seconds)
{
    amt_timer_create(timer_ptr, callback);
    amt_timer_set(timer_ptr, seconds * 1000);
}

/* Requires the lock, as do the next two. */
void stop_timing()
{
    g_handshake.m_is_over = true;
    amt_timer_delete(&g_handshake.m_link_timer);
    amt_timer_delete(&g_handshake.m_data_timer);
}

void set_ready()
{
    amt_timer_delete(&g_handshake.m_link_timer);
    g_handshake.m_is_ready = true;
}

bool is_waiting_for_data()
{
    return g_handshake.m_is_ready && !g_handshake.m_is_done && !g_handshake.m_is_over;
}

/* A timer that was deleted when its call was on the way already has not run out. */
bool has_run_out(const amt_timer_st &timer)
{
    const std::lock_guard<pub_mutex_c> lock(g_mutex);
    return is_armed(timer);
}

void handle_data_time_out(sigval)
{
    if (has_run_out(g_handshake.m_data_timer)) {
        PUB_LOG(g_amt_handle_log, "timeout. time:%d seconds.", DATA_SECONDS);
        amt_handle_exit_by_handshake();
    }
}

void handle_link_time_out(sigval)
{
    if (has_run_out(g_handshake.m_link_timer)) {
        PUB_LOG(g_amt_handle_log, "usb enum timeout. time:%d seconds.", LINK_SECONDS);
        amt_handle_exit_by_handshake();
    }
}

bool is_text_one(const char *text)
{
    return text[0] == '1' && text[1 + strspn(text + 1, "\r\n")] == '\0';
}

/* Whether the file can be read into text_ptr (FILE_TEXT_SIZE bytes). */
bool read_shown(char *text_ptr, const char *path)
{
    if (amt_read_data_from_file(text_ptr, FILE_TEXT_SIZE, path) != PUB_ERR_NONE) {
        return false;
    }
    PUB_LOG(g_amt_handle_log, "readed success from file(%s). value: %s.", path, text_ptr);
    return true;
}

bool is_forbidden_by_file()
{
    char text_a[AMT_PERMISSION_TEXT_SIZE];
    bool is_read = false;
    const int flag = amt_permission_read(text_a, &is_read);
    if (is_read) {
        PUB_LOG(g_amt_handle_log, "readed success from file(%s). flag: %s.", AMT_PERMISSION_FILE, text_a);
    }
    return flag == static_cast<int>(amt_permission_en::FORBID);
}

bool is_forbidden()
{
    char text_a[FILE_TEXT_SIZE];
    if (read_shown(text_a, AC_FILE) && is_text_one(text_a)) {
        PUB_LOG(g_amt_handle_log, "power-supply is ac, do not enter amt by handshake. will exit");
        g_is_ac_power = true;
        return true;
    }
    if (is_forbidden_by_file()) {
        PUB_LOG(g_amt_handle_log, "do not permit to enter amt by handshake. will exit");
        return true;
    }
    PUB_LOG(g_amt_handle_log, "permit to enter amt by handshake.");
    return false;
}

/* Tells the platform why a USB-inserted start has ended. */
void amt_set_handshake_property()
{
    char text_a[AMT_PERMISSION_TEXT_SIZE];
    bool is_read = false;
    const bool is_permitted = !g_is_ac_power && amt_permission_read(text_a, &is_read) !=
                                                    static_cast<int>(amt_permission_en::FORBID);
    const char *const value = is_permitted ? "2" : "1";
    PUB_LOG(g_amt_handle_log, "%s",
            is_permitted ? "permit to enter amt by handshake. "
                         : "do not permit to enter amt by handshake. ");
    property_set(FAILURE_PROPERTY, value);
    PUB_LOG(g_amt_handle_log, "set property(%s) to %s.", FAILURE_PROPERTY, value);
}

bool is_ready()
{
    const std::lock_guard<pub_mutex_c> lock(g_mutex);
    return g_handshake.m_is_ready;
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

} // namespace

int amt_handshake_ask_permission()
{
    g_is_property_set = false;
    g_is_ac_power = false;
    if (g_usb_activate == 0) {
        return PUB_ERR_NONE;
    }
    PUB_LOG(g_amt_handle_log, "will treat handshake.");
    {
        const std::lock_guard<pub_mutex_c> lock(g_mutex);
        g_handshake.m_is_ready = false;
        g_handshake.m_is_done = false;
        g_handshake.m_is_over = false;
        g_handshake.m_link_timer.m_id = -1;
        g_handshake.m_data_timer.m_id = -1;
    }
    if (is_forbidden()) {
        amt_handle_exit_by_handshake();
        return PUB_ERR_FAIL;
    }
    return PUB_ERR_NONE;
}

void amt_handshake_begin()
{
    if (g_usb_activate != 0) {
        const std::lock_guard<pub_mutex_c> lock(g_mutex);
        arm(&g_handshake.m_link_timer, handle_link_time_out, LINK_SECONDS);
    }
}

void amt_handshake_link_up()
{
    const std::lock_guard<pub_mutex_c> lock(g_mutex);
    set_ready();
}

void amt_handshake_link_down()
{
    const std::lock_guard<pub_mutex_c> lock(g_mutex);
    g_handshake.m_is_ready = false;
}

void amt_handshake_modem_data()
{
    if (g_usb_activate == 0) {
        return;
    }
    char text_a[FILE_TEXT_SIZE];
    if (!is_ready() && read_shown(text_a, USB_STATE_FILE) && strstr(text_a, "CONFIGURED") != nullptr) {
        amt_handshake_link_up();
    }
    const std::lock_guard<pub_mutex_c> lock(g_mutex);
    if (is_waiting_for_data() && !is_armed(g_handshake.m_data_timer)) {
        PUB_LOG(g_amt_handle_log, "will create timer.");
        arm(&g_handshake.m_data_timer, handle_data_time_out, DATA_SECONDS);
    }
}

bool amt_handshake_pc_data()
{
    if (g_usb_activate == 0) {
        return false;
    }
    const std::lock_guard<pub_mutex_c> lock(g_mutex);
    if (!g_handshake.m_is_ready) {
        set_ready();
    }
    if (!is_waiting_for_data() || !is_armed(g_handshake.m_data_timer)) {
        return false;
    }
    g_handshake.m_is_done = true;
    amt_timer_delete(&g_handshake.m_data_timer);
    PUB_LOG(g_amt_handle_log, "handshake success.");
    return true;
}

void amt_handshake_show_success()
{
    start_picture();
    const amt_mode_en mode = g_handle_state.m_amt_mode;
    const int charge_mode = mode == amt_mode_en::PC_TEXT ? 1 : 0;
    const int status = amt_usb_charge_ctrl(charge_mode);
    PUB_LOG(g_amt_handle_log, "call amt_usb_charge_ctrl. return:%d, current amt mode:%d, usb_charge_mode:%d.",
            status, static_cast<int>(mode), charge_mode);
}

void amt_handle_exit_by_handshake()
{
    amt_set_handshake_property();
    g_is_property_set = true;
    {
        const std::lock_guard<pub_mutex_c> lock(g_mutex);
        stop_timing();
    }
    kill(getpid(), SIGTERM);
}

void amt_handshake_end()
{
    const bool is_locked = lock_for_the_end();
    stop_timing();
    if (is_locked) {
        g_mutex.unlock();
    }
    if (g_usb_activate != 0 && !g_is_property_set.exchange(true)) {
        amt_set_handshake_property();
    }
}
