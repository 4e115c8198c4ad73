#include "amt/amt-handle/at/at-command.h"

#include <string_view>

#include "amt/amt-handle/at/at-handler.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

/* A command's text is looked for anywhere in the request; its handler gets what stands behind it. */
struct at_command_st
{
    const char *m_text_ptr;
    int (*m_handler)(const char *operands);
};

/* Every text below begins so. A request without it, a bulk of data for the modem, is searched once. */
constexpr std::string_view TEXT_START = "AT^D";

/* Looked for in this order, and the first found is served. A carriage return in a text must match. */
constexpr at_command_st g_at_command_a[] = {
    {"AT^DBTADDR?\r", amt_at_read_bt_address},      {"AT^DBTADDR=?\r", amt_at_test_only},
    {"AT^DBTADDR=\"", amt_at_write_bt_address},     {"AT^DWIFIADDR?\r", amt_at_read_wifi_address},
    {"AT^DWIFIADDR=?\r", amt_at_test_only},         {"AT^DWIFIADDR=\"", amt_at_write_wifi_address},
    {"AT^DSVER\r", amt_at_read_sw_version},         {"AT^DAMTOFF\r", amt_at_power_off},
    {"AT^DDEVCONNCHK=", amt_at_check_device},       {"AT^DBTCTRL=", amt_at_control_bt},
    {"AT^DGPSCTRL=", amt_at_control_gps},           {"AT^DWLTSD=", handle_amt_device_wifi_tx_ctrl},
    {"AT^DWLTRD=", handle_amt_device_wifi_rx_ctrl}, {"AT^DPCBACTRL=", amt_at_control_pcba},
    {"AT^DAMT1=", amt_at_control_permission},       {"AT^DENTERIDLE", amt_at_enter_idle},
    {"AT^DBOOTDLFIN", amt_at_read_boot_dl_fin},     {"AT^DEMMCINFO?\r", amt_at_read_emmc_info},
};

constexpr bool begin_all_alike()
{
    for (const at_command_st &command : g_at_command_a) {
        for (size_t i = 0; i < TEXT_START.size(); i++) {
            if (command.m_text_ptr[i] != TEXT_START[i]) {
                return false;
            }
        }
    }
    return true;
}
static_assert(begin_all_alike());

} // namespace

int handle_amt_pc_req_at()
{
    if (g_handle_context.m_req.m_buf_len == 0) {
        return pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
    }
    const std::string_view request = amt_handle_get_text(g_handle_context.m_req);
    if (request.find(TEXT_START) == std::string_view::npos) {
        return amt_modem_write_request();
    }
    for (const at_command_st &command : g_at_command_a) {
        const std::string_view text = command.m_text_ptr;
        const size_t found = request.find(text);
        const int status = found != std::string_view::npos
                               ? command.m_handler(request.data() + found + text.size())
                               : PUB_ERR_NOT_FOUND;
        if (status != PUB_ERR_NOT_FOUND) {
            return status;
        }
    }
    return amt_modem_write_request();
}
