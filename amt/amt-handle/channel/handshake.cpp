#include "amt/amt-handle/channel/handshake.h"

#include <errno.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-handle/request/factory-file.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "platform/include/cutils/properties.h"
#include "pub/error.h"

namespace {

constexpr char AC_FILE[] = "/sys/class/power_supply/ac/online";
constexpr char PERMISSION_FILE[] = "/amt/power_usb_amt.txt";
constexpr char FAILURE_PROPERTY[] = "sys.vx.amt.failure.handshake";

constexpr uint32_t FILE_TEXT_SIZE = 100;
constexpr int USB_ENUM_SECONDS = 20;
constexpr int HANDSHAKE_SECONDS = 5;

constexpr int OP_FORBID = 0;
constexpr int OP_PERMIT = 1;
constexpr int OP_READ = 2;

void handle_handshake_time_out(sigval)
{
    PUB_LOG(g_amt_handle_log, "timeout. time:%d seconds.", HANDSHAKE_SECONDS);
    amt_handle_exit_by_handshake();
}

void handle_usb_enum_time_out(sigval)
{
    PUB_LOG(g_amt_handle_log, "usb enum timeout. time:%d seconds.", USB_ENUM_SECONDS);
    amt_handle_exit_by_handshake();
}

bool is_text_one(const char *text)
{
    return text[0] == '1' && text[1 + strspn(text + 1, "\r\n")] == '\0';
}

bool is_forbidden_by_ac_power()
{
    char text_a[FILE_TEXT_SIZE];
    if (amt_read_data_from_file(text_a, sizeof(text_a), AC_FILE) != PUB_ERR_NONE) {
        return false;
    }
    PUB_LOG(g_amt_handle_log, "readed success from file(%s). value: %s.", AC_FILE, text_a);
    return is_text_one(text_a);
}

/* Whether the permission file could be read; its number goes to *flag_ptr. */
bool read_permission(int *flag_ptr, char *text, uint32_t size)
{
    if (amt_read_data_from_file(text, size, PERMISSION_FILE) != PUB_ERR_NONE) {
        return false;
    }
    *flag_ptr = atoi(text);
    return true;
}

bool is_forbidden_by_file()
{
    char text_a[FILE_TEXT_SIZE];
    int flag = 0;
    if (!read_permission(&flag, text_a, sizeof(text_a))) {
        return false;
    }
    PUB_LOG(g_amt_handle_log, "readed success from file(%s). flag: %s.", PERMISSION_FILE, text_a);
    return flag == OP_FORBID;
}

void set_failure_property(const char *value)
{
    property_set(FAILURE_PROPERTY, value);
    PUB_LOG(g_amt_handle_log, "set property(%s) to %s.", FAILURE_PROPERTY, value);
}

int refuse_start()
{
    amt_handle_exit_by_handshake();
    return PUB_ERR_FAIL;
}

/* Makes the digit durable. The log says which step failed. */
int amt_write_content_to_file_sync(const char *digit)
{
    switch (amt_factory_file_write(PERMISSION_FILE, digit)) {
    case amt_factory_step_en::DONE:
        PUB_LOG(g_amt_handle_log, "Writed to file(%s) success.flag: %s.", PERMISSION_FILE, digit);
        return PUB_ERR_NONE;
    case amt_factory_step_en::OPEN_FAILED:
        pub_log_error(g_amt_handle_log, PUB_ERR_FILE);
        PUB_LOG(g_amt_handle_log, "open(\"%s\") fail: %d - %s", PERMISSION_FILE, errno, strerror(errno));
        break;
    case amt_factory_step_en::WRITE_FAILED:
        pub_log_error(g_amt_handle_log, PUB_ERR_FILE);
        PUB_LOG(g_amt_handle_log, "fputs fail: %d - %s", errno, strerror(errno));
        break;
    }
    return PUB_ERR_FILE;
}

int write_permission(int op_type, int *flag_ptr)
{
    if (amt_write_content_to_file_sync(op_type == OP_PERMIT ? "1" : "0") != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, PUB_ERR_FAIL, "handle_amt_damt1_operation");
        PUB_LOG(g_amt_handle_log, "write error to do-not-permit-handshake file.");
        return PUB_ERR_FAIL;
    }
    *flag_ptr = op_type;
    return PUB_ERR_NONE;
}

} // namespace

handshake_state_st g_handshake_state;

void amt_handshake_start_usb_enum_timer()
{
    amt_timer_create(&g_handshake_state.m_usb_enum_timer, handle_usb_enum_time_out);
    amt_timer_set(&g_handshake_state.m_usb_enum_timer, USB_ENUM_SECONDS * 1000);
}

void amt_handshake_start_timer()
{
    amt_timer_create(&g_handshake_state.m_handshake_timer, handle_handshake_time_out);
    amt_timer_set(&g_handshake_state.m_handshake_timer, HANDSHAKE_SECONDS * 1000);
}

void amt_handle_exit_by_handshake()
{
    amt_set_handshake_property();
    g_handshake_state.m_is_property_set = 1;
    amt_timer_delete(&g_handshake_state.m_usb_enum_timer);
    amt_timer_delete(&g_handshake_state.m_handshake_timer);
    kill(getpid(), SIGTERM);
}

void amt_set_handshake_property()
{
    char text_a[FILE_TEXT_SIZE];
    int flag = OP_PERMIT;
    if (g_handshake_state.m_is_ac_power == 0) {
        read_permission(&flag, text_a, sizeof(text_a));
    }
    if (g_handshake_state.m_is_ac_power != 0 || flag == OP_FORBID) {
        PUB_LOG(g_amt_handle_log, "do not permit to enter amt by handshake. ");
        set_failure_property("1");
        return;
    }
    PUB_LOG(g_amt_handle_log, "permit to enter amt by handshake. ");
    set_failure_property("2");
}

int amt_handshake_check_permission()
{
    if (is_forbidden_by_ac_power()) {
        PUB_LOG(g_amt_handle_log, "power-supply is ac, do not enter amt by handshake. will exit");
        g_handshake_state.m_is_ac_power = 1;
        return refuse_start();
    }
    if (is_forbidden_by_file()) {
        PUB_LOG(g_amt_handle_log, "do not permit to enter amt by handshake. will exit");
        return refuse_start();
    }
    PUB_LOG(g_amt_handle_log, "permit to enter amt by handshake.");
    return PUB_ERR_NONE;
}

int handle_amt_damt1_operation(int op_type, int *flag_ptr)
{
    if (op_type == OP_FORBID || op_type == OP_PERMIT) {
        return write_permission(op_type, flag_ptr);
    }
    if (op_type != OP_READ) {
        pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
        PUB_LOG(g_amt_handle_log, "unknown operation type: %u", static_cast<unsigned>(op_type));
        return PUB_ERR_PARAM;
    }
    char text_a[FILE_TEXT_SIZE];
    *flag_ptr = OP_PERMIT;
    read_permission(flag_ptr, text_a, sizeof(text_a));
    return PUB_ERR_NONE;
}
