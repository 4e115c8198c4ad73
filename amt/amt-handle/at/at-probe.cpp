#include "amt/amt-handle/at/at-command.h"

#include <string.h>
#include <strings.h>

#include "amt/amt-cfg.h"
#include "amt/amt-device/test-hal.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/tty.h"
#include "amt/amt-log.h"

namespace {

constexpr char PROBE[] = "AT\r";
constexpr uint32_t PROBE_SIZE = sizeof(PROBE) - 1;
constexpr uint32_t PROBE_MAX_SIZE = 5; /* with a line feed, or noise */
constexpr char PROBE_COMMAND[] = "AT;^DLKS=1\r";

bool is_probe_at(const amt_buf_st *req_ptr, uint32_t offset)
{
    return req_ptr->m_buf_len >= offset + PROBE_SIZE &&
           strncasecmp(reinterpret_cast<const char *>(req_ptr->m_buf_a) + offset, PROBE, PROBE_SIZE) == 0;
}

/* A station that got no answer probes again: behind its first line end, or behind that of two characters. */
bool is_repeated(const amt_buf_st *req_ptr)
{
    return is_probe_at(req_ptr, PROBE_SIZE) || is_probe_at(req_ptr, PROBE_SIZE + 1);
}

void replace_request(amt_buf_st *req_ptr)
{
    amt_handle_clear_buf(req_ptr);
    memcpy(req_ptr->m_buf_a, PROBE_COMMAND, sizeof(PROBE_COMMAND) - 1);
    req_ptr->m_buf_len = sizeof(PROBE_COMMAND) - 1;
}

void enter_mode_4()
{
    if (g_handle_state.m_amt_mode.exchange(amt_mode_en::PC_TEXT) == amt_mode_en::PC_TEXT) {
        return;
    }
    PUB_LOG(g_amt_handle_log, "mark to enter amt4");
    const int status = amt_usb_charge_ctrl(1);
    PUB_LOG(g_amt_handle_log, "call amt_usb_charge_ctrl for amt4. return:%d, current amt mode:%d.", status,
            static_cast<int>(g_handle_state.m_amt_mode.load()));
}

} // namespace

void amt_at_probe_rewrite()
{
    amt_buf_st *const req_ptr = &g_handle_context.m_req;
    if (!is_probe_at(req_ptr, 0)) {
        return;
    }
    const bool is_short = req_ptr->m_buf_len <= PROBE_MAX_SIZE;
    if (is_short) {
        amt_tty_set_modem_speed(g_amt_cfg.m_modem_uart_at_baudrate);
    }
    if (is_short || is_repeated(req_ptr)) {
        replace_request(req_ptr);
        enter_mode_4();
    }
}
