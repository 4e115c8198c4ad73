#include "amt/amt-handle/at/at-handler.h"

#include <stdint.h>
#include <stdlib.h>

#include "amt/amt-handle/at/at-operand.h"
#include "amt/amt-log.h"
#include "platform/include/ldt.h"
#include "pub/error.h"

namespace {

/* The first operand of the GPS command: other numbers than the library's. */
constexpr int GPS_FLAG_STOP = 0;
constexpr int GPS_FLAG_READ = 2;

/* The channel of the last reception that was started here: its stop names it. */
uint8_t g_rx_channel = 0;

int reply_result(int32_t result)
{
    return result == 0 ? amt_at_reply_ok() : amt_at_reply_error();
}

/* What a request without a number asks for: no device, and no state, has this one. */
constexpr int NO_NUMBER = -1;

/* The number behind prefix in the request, or NO_NUMBER. */
int get_number(const char *prefix)
{
    char text_a[AMT_AT_PARA_SIZE + 1] = {};
    uint32_t length = 0;
    const int status = handle_amt_get_at_para(prefix, text_a, &length);
    return status == PUB_ERR_NONE && length > 0 ? atoi(text_a) : NO_NUMBER;
}

/* Takes the next operand as a number. A missing one is logged under its name. */
bool take_number(amt_at_operands_st *list_ptr, const char *name, const char *func, int *number_ptr)
{
    const char *const text = amt_at_operands_next(list_ptr);
    if (text == nullptr) {
        pub_log_fail({g_amt_handle_log, func}, PUB_ERR_PARAM, "%s is null!!!", name);
        return false;
    }
    *number_ptr = atoi(text);
    return true;
}

int read_gps_signal(amt_at_operands_st *list_ptr)
{
    int index = 0;
    if (ldt_gpsCtrl(LDT_START, 0, nullptr, nullptr) != 0 ||
        !take_number(list_ptr, "index", "amt_at_control_gps", &index))
    {
        return amt_at_reply_error();
    }
    int32_t svid = 0;
    int32_t cnr = 0;
    if (ldt_gpsCtrl(LDT_GPS_READ_SIGNAL, index, &svid, &cnr) != 0) {
        return amt_at_reply_error();
    }
    return amt_at_reply("\r\n^DGPSCTRL: %d,%d\r\n\r\nOK\r\n", svid, cnr);
}

/* The library's answer, once it is logged. */
int32_t log_end(const char *title, int32_t answer)
{
    PUB_LOG(g_amt_handle_log, "%s end. return:%d.", title, answer);
    return answer;
}

/* The test first, then the radio: both must have stopped. */
int32_t stop_radio(int32_t test_answer)
{
    const int32_t radio_answer = ldt_wifiCtrl(LDT_STOP);
    return test_answer != 0 ? test_answer : radio_answer;
}

int32_t stop_tx()
{
    PUB_LOG(g_amt_handle_log, "WIFI-TX-stop start. ");
    return stop_radio(log_end("WIFI-TX-stop", ldt_TxTest(LDT_STOP, 0, 0, 0)));
}

int32_t start_tx(amt_at_operands_st *list_ptr)
{
    static constexpr char func[] = "handle_amt_device_wifi_tx_ctrl";
    int channel = 0;
    int rate = 0;
    int power = 0;
    if (ldt_wifiCtrl(LDT_START) != 0 || !take_number(list_ptr, "channel", func, &channel) ||
        !take_number(list_ptr, "rate", func, &rate) || !take_number(list_ptr, "power", func, &power))
    {
        return PUB_ERR_FAIL;
    }
    const auto power_16 = static_cast<int16_t>(power);
    const auto rate_16 = static_cast<uint16_t>(rate);
    const auto channel_8 = static_cast<uint8_t>(channel);
    PUB_LOG(g_amt_handle_log, "WIFI-TX-start start. channel:%d; power:%d; rate:%d(will multi 100)", channel_8,
            power_16, rate_16);
    return log_end("WIFI-TX-start", ldt_TxTest(LDT_START, power_16, rate_16, channel_8));
}

int32_t stop_rx()
{
    int32_t count = 0;
    PUB_LOG(g_amt_handle_log, "WIFI-RX-stop start. channel:%d", g_rx_channel);
    const int32_t answer = ldt_RxTest(LDT_STOP, g_rx_channel, 0, &count);
    PUB_LOG(g_amt_handle_log, "WIFI-RX-stop end. return:%d; cnt:%d.", answer, count);
    return stop_radio(answer);
}

int32_t start_rx(amt_at_operands_st *list_ptr)
{
    static constexpr char func[] = "handle_amt_device_wifi_rx_ctrl";
    int channel = 0;
    int rate = 0;
    if (ldt_wifiCtrl(LDT_START) != 0 || !take_number(list_ptr, "channel", func, &channel) ||
        !take_number(list_ptr, "rate", func, &rate))
    {
        return PUB_ERR_FAIL;
    }
    const auto channel_8 = static_cast<uint8_t>(channel);
    const auto rate_16 = static_cast<uint16_t>(rate);
    PUB_LOG(g_amt_handle_log, "WIFI-RX-start start. channel:%d; rate:%d(will multi 100)", channel_8, rate_16);
    const int32_t answer = log_end("WIFI-RX-start", ldt_RxTest(LDT_START, channel_8, rate_16, nullptr));
    if (answer == 0) {
        g_rx_channel = channel_8;
    }
    return answer;
}

/* Both Wi-Fi tests: the first operand stops or starts, the rest is the start's. */
int control_wifi_test(const char *operands, const char *func, int32_t (*stop)(),
                      int32_t (*start)(amt_at_operands_st *))
{
    amt_at_operands_st list;
    amt_at_operands_init(&list, operands);
    int control = 0;
    if (!take_number(&list, "control", func, &control)) {
        return PUB_ERR_PARAM;
    }
    if (control == LDT_STOP) {
        return reply_result(stop());
    }
    return reply_result(control == LDT_START ? start(&list) : PUB_ERR_FAIL);
}

} // namespace

int amt_at_check_device(const char *)
{
    switch (get_number("AT^DDEVCONNCHK=")) {
    case 0:
        return reply_result(ldt_wifiCheck());
    case 1:
        return reply_result(ldt_gpsCheck());
    case 3:
        return reply_result(ldt_btCheck());
    default:
        return amt_at_reply_error();
    }
}

int amt_at_control_bt(const char *)
{
    const int on = get_number("AT^DBTCTRL=");
    const bool is_known = on == LDT_STOP || on == LDT_START;
    return is_known ? reply_result(ldt_btCtrl(on)) : amt_at_reply_error();
}

int amt_at_control_gps(const char *operands)
{
    amt_at_operands_st list;
    amt_at_operands_init(&list, operands);
    int flag = 0;
    if (!take_number(&list, "flag", __func__, &flag)) {
        return PUB_ERR_PARAM;
    }
    if (flag == GPS_FLAG_STOP) {
        return reply_result(ldt_gpsCtrl(LDT_STOP, 0, nullptr, nullptr));
    }
    return flag == GPS_FLAG_READ ? read_gps_signal(&list) : amt_at_reply_error();
}

int handle_amt_device_wifi_tx_ctrl(const char *operands)
{
    return control_wifi_test(operands, __func__, stop_tx, start_tx);
}

int handle_amt_device_wifi_rx_ctrl(const char *operands)
{
    return control_wifi_test(operands, __func__, stop_rx, start_rx);
}
