#include "platform/include/ldt.h"

#include <stdio.h>

#include "platform/host/stand-in/stand-in.h"

namespace {

constexpr int32_t PLAUSIBLE_PACKET_COUNT = 1000;
constexpr int32_t PLAUSIBLE_CNR = 41;

constexpr uint32_t ARGUMENTS_SIZE = 96;

/* How a pointer argument is shown in the record. */
const char *shown(const int32_t *pointer)
{
    return pointer != nullptr ? "out" : "null";
}

void store(const stand_in_answer_st &answer, uint32_t place, int32_t plausible, int32_t *out)
{
    if (out != nullptr) {
        *out = stand_in_out_value(&answer, place, plausible, *out);
    }
}

int32_t answer_number(const char *function, int32_t argument)
{
    char arguments_a[ARGUMENTS_SIZE];
    snprintf(arguments_a, sizeof(arguments_a), "%d", argument);
    return stand_in_answer_call(function, arguments_a);
}

} // namespace

STAND_IN_INTERFACE int32_t ldt_btCtrl(int32_t on)
{
    return answer_number("ldt_btCtrl", on);
}

STAND_IN_INTERFACE int32_t ldt_btCheck(void)
{
    return stand_in_answer_call("ldt_btCheck", "");
}

STAND_IN_INTERFACE int32_t ldt_wifiCtrl(int32_t on)
{
    return answer_number("ldt_wifiCtrl", on);
}

STAND_IN_INTERFACE int32_t ldt_wifiCheck(void)
{
    return stand_in_answer_call("ldt_wifiCheck", "");
}

STAND_IN_INTERFACE int32_t ldt_TxTest(int32_t on, int32_t power, int32_t rate, int32_t channel)
{
    char arguments_a[ARGUMENTS_SIZE];
    snprintf(arguments_a, sizeof(arguments_a), "%d, %d, %d, %d", on, power, rate, channel);
    return stand_in_answer_call("ldt_TxTest", arguments_a);
}

STAND_IN_INTERFACE int32_t ldt_RxTest(int32_t on, int32_t channel, int32_t rate, int32_t *count_out)
{
    stand_in_answer_st answer;
    const int32_t status = stand_in_take_answer("ldt_RxTest", &answer);
    store(answer, 0, PLAUSIBLE_PACKET_COUNT, count_out);
    if (count_out == nullptr) {
        stand_in_record("ldt_RxTest(%d, %d, %d, null) = %d", on, channel, rate, status);
    } else {
        stand_in_record("ldt_RxTest(%d, %d, %d, out) = %d [%d]", on, channel, rate, status, *count_out);
    }
    return status;
}

STAND_IN_INTERFACE int32_t ldt_gpsCtrl(int32_t operation, int32_t index, int32_t *svid_out, int32_t *cnr_out)
{
    stand_in_answer_st answer;
    const int32_t status = stand_in_take_answer("ldt_gpsCtrl", &answer);
    /* Any index of a station is counted on, the largest too. */
    store(answer, 0, static_cast<int32_t>(static_cast<uint32_t>(index) + 1), svid_out);
    store(answer, 1, PLAUSIBLE_CNR, cnr_out);
    char arguments_a[ARGUMENTS_SIZE];
    snprintf(arguments_a, sizeof(arguments_a), "%d, %d, %s, %s", operation, index, shown(svid_out),
             shown(cnr_out));
    if (svid_out == nullptr || cnr_out == nullptr) {
        stand_in_record("ldt_gpsCtrl(%s) = %d", arguments_a, status);
    } else {
        stand_in_record("ldt_gpsCtrl(%s) = %d [%d %d]", arguments_a, status, *svid_out, *cnr_out);
    }
    return status;
}

STAND_IN_INTERFACE int32_t ldt_gpsCheck(void)
{
    return stand_in_answer_call("ldt_gpsCheck", "");
}
