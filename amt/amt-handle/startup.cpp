#include "amt/amt-handle/startup.h"

#include <atomic>
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <termios.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/at-io.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/tty.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "amt/amt-handle/reader/reader.h"
#include "amt/amt-handle/reader/registry.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "platform/include/cutils/properties.h"
#include "pub/error.h"
#include "pub/util/thread-end.h"
#include "pub/util/util.h"

namespace {

constexpr char SWITCH_PROPERTY[] = "amt.normal.amt.switch_status";

/* Can never be taken for "1". */
constexpr char SWITCH_DEFAULT[] = "@##@";

constexpr char BT_FOLDER[] = "/amt/BT";
constexpr char WIFI_FOLDER[] = "/amt/WIFI";

/* The station's port needs this long after it was opened. */
constexpr uint32_t PC_TTY_PAUSE_MS = 1000;

std::atomic<int> g_is_deinit_done;

void prepare_factory_data()
{
    amt_identity_reset();
    if (amt_make_folder(BT_FOLDER) == PUB_ERR_NONE) {
        amt_make_folder(WIFI_FOLDER);
    }
    amt_write_wifi_to_nvram_file();
}

void prepare_context()
{
    amt_handle_clear_context();
    snprintf(g_handle_context.m_pty.m_pts_mapping_name_a, sizeof(g_handle_context.m_pty.m_pts_mapping_name_a),
             "%s", g_amt_cfg.m_tty_app_a);
    amt_handle_register_all();
    g_handle_state.m_is_no_modem = 0;
}

/* Whether the last switch to factory test asks a normal start to serve the PC. */
bool is_switched_to_amt()
{
    char value_a[PROPERTY_VALUE_MAX] = {};
    if (property_get(SWITCH_PROPERTY, value_a, SWITCH_DEFAULT) <= 0 || strcmp(value_a, "1") != 0) {
        return false;
    }
    PUB_LOG(g_amt_handle_log, "property-%s value: %s", SWITCH_PROPERTY, value_a);
    PUB_LOG(g_amt_handle_log, "will create amt1/4 thread. ");
    return true;
}

/* The station's port, not the modem's: its local flags stay as whoever set the port up left them. */
int set_serial_dev_attr(int fd)
{
    termios attr = {};
    if (tcgetattr(fd, &attr) != 0) {
        return pub_log_call_error(g_amt_handle_log, "tcgetattr", PUB_ERR_SYS_CALL);
    }
    attr.c_cflag &= ~static_cast<tcflag_t>(CBAUD | CBAUDEX);
    attr.c_cflag |= B115200;
    attr.c_iflag &= ~static_cast<tcflag_t>(INLCR | ICRNL | IXON);
    attr.c_oflag &= ~static_cast<tcflag_t>(OPOST);
    if (tcsetattr(fd, TCSANOW, &attr) != 0) {
        return pub_log_call_error(g_amt_handle_log, "tcsetattr", PUB_ERR_SYS_CALL);
    }
    return PUB_ERR_NONE;
}

int open_pc_tty()
{
    const int status = amt_tty_open(&g_handle_context.m_fd_pc, g_amt_cfg.m_tty_pc_a, AMT_TTY_ATTEMPTS);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    pub_util_sleep_ms(PC_TTY_PAUSE_MS);
    return set_serial_dev_attr(g_handle_context.m_fd_pc);
}

/* Starts a worker of the PC path, unless the path has failed already. */
int start_pc_worker(int status, amt_worker_st *worker_ptr, void (*loop)(),
                    const pub_log_place_st &place = g_amt_handle_log)
{
    const int error = status == PUB_ERR_NONE ? amt_worker_start(worker_ptr, loop) : 0;
    if (error == 0) {
        return status;
    }
    errno = error;
    return pub_log_fail(place, PUB_ERR_FILE, "pthread_create(): %d - %s", error, strerror(error));
}

int init_for_amt_1_4()
{
    pub_log_entry(g_amt_handle_log);
    amt_handshake_begin();
    int status = open_pc_tty();
    status = status == PUB_ERR_NONE ? amt_tty_open_modem() : status;
    status = start_pc_worker(status, &g_handle_context.m_pc_reader, amt_handle_read_pc_loop);
    status = start_pc_worker(status, &g_handle_context.m_modem_reader, amt_handle_read_modem_loop);
    g_handle_state.m_usb_state = amt_usb_en::UNKNOWN;
    status = start_pc_worker(status, &g_handle_context.m_usb_monitor, amt_handle_monitor_usb_loop);
    if (status == PUB_ERR_NONE) {
        return PUB_ERR_NONE;
    }
    amt_worker_stop(&g_handle_context.m_modem_reader);
    amt_worker_stop(&g_handle_context.m_pc_reader);
    amt_worker_stop(&g_handle_context.m_usb_monitor);
    amt_handle_close_fd(&g_handle_context.m_fd_modem);
    amt_handle_close_fd(&g_handle_context.m_fd_pc);
    return status;
}

void open_at_mux()
{
    if (amt_at_open() == PUB_ERR_NONE || g_handle_context.m_fd_at > 0) {
        return; /* one that was lost again is open, and found again by the first request that needs it */
    }
    g_handle_state.m_is_no_modem = 1;
    PUB_LOG(g_amt_handle_log, "WARNING !");
    PUB_LOG(g_amt_handle_log, "The AT device is not opened with modem.");
}

void close_pty()
{
    if (g_handle_context.m_pty.m_ptm_fd > 0) {
        pub_pty_close(&g_handle_context.m_pty);
    }
}

int start_app_reader(const pub_log_place_st &place = g_amt_handle_log)
{
    const int error = amt_worker_start(&g_handle_context.m_app_reader, amt_handle_read_app_loop);
    if (error == 0) {
        return PUB_ERR_NONE;
    }
    errno = error;
    return pub_log_fail(place, PUB_ERR_FILE, "pthread_create() fail: %d", error);
}

int init_for_amt_2_3()
{
    pub_log_entry(g_amt_handle_log);
    int status = pub_pty_open(&g_handle_context.m_pty);
    if (status == PUB_ERR_NONE) {
        open_at_mux();
        status = start_app_reader();
    }
    if (status != PUB_ERR_NONE) {
        amt_worker_stop(&g_handle_context.m_app_reader);
        amt_handle_close_fd(&g_handle_context.m_fd_at);
        close_pty();
    }
    g_handle_state.m_amt_mode = amt_mode_en::APP;
    return status;
}

} // namespace

int amt_handle_init(int normal_mode)
{
    pub_log_entry(g_amt_handle_log);
    amt_service_process_mark();
    g_handle_state.m_amt_mode = amt_mode_en::PC_PACKETS;
    if (amt_handshake_ask_permission() != PUB_ERR_NONE) {
        return PUB_ERR_FAIL;
    }
    prepare_factory_data();
    prepare_context();
    const bool is_packet_path = normal_mode != 0 && !is_switched_to_amt();
    const int status = is_packet_path ? init_for_amt_2_3() : init_for_amt_1_4();
    if (status == PUB_ERR_NONE) {
        g_handle_state.m_is_normal_mode = normal_mode;
    }
    return status;
}

int amt_handle_deinit()
{
    if (g_is_deinit_done.exchange(1) != 0) {
        return PUB_ERR_NONE;
    }
    pub_log_entry(g_amt_handle_log);
    amt_worker_stop(&g_handle_context.m_modem_reader);
    amt_worker_stop(&g_handle_context.m_pc_reader);
    amt_worker_stop(&g_handle_context.m_usb_monitor);
    amt_worker_stop(&g_handle_context.m_app_reader);
    close_pty();
    amt_handle_close_fd(&g_handle_context.m_fd_pc);
    amt_handle_close_fd(&g_handle_context.m_fd_at);
    amt_handle_close_fd(&g_handle_context.m_fd_modem);
    amt_handshake_end();
    return PUB_ERR_NONE;
}
