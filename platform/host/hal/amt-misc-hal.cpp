#include "platform/include/amt-misc-hal.h"

#include <stdio.h>
#include <string.h>

#include "platform/host/stand-in/stand-in.h"

STAND_IN_INTERFACE int32_t create_devinfo(char *text, int32_t capacity);
STAND_IN_INTERFACE int32_t enter_idle(void);
STAND_IN_INTERFACE int32_t amt_usb_charger_enable(int32_t mode);
STAND_IN_INTERFACE int32_t amt_check_system_sanity(void);

namespace {

constexpr char PLAUSIBLE_DEVINFO[] =
    "board: tq5530 rev 2; ram: 1024 MB; emmc: 8 GB; lcd: 480x800; touch: 1.4; "
    "camera: 5 MP / 0.3 MP; sensors: accelerometer, proximity, light";

/* Copies a scripted text of at most capacity characters; "\n" in it stands for a line feed. The length. */
int32_t copy_text(char *text, int32_t capacity, const char *script)
{
    int32_t length = 0;
    while (*script != '\0' && length < capacity) {
        const bool is_break = script[0] == '\\' && script[1] == 'n';
        text[length++] = is_break ? '\n' : *script;
        script += is_break ? 2 : 1;
    }
    if (length < capacity) {
        text[length] = '\0';
    }
    return length;
}

} // namespace

STAND_IN_INTERFACE int32_t create_devinfo(char *text, int32_t capacity)
{
    stand_in_answer_st answer;
    const int32_t status = stand_in_take_answer(AMT_MISC_HAL_CREATE_DEVINFO, &answer);
    const bool is_plausible = status == 0 && answer.m_rest_a[0] == '\0';
    const int32_t length = copy_text(text, capacity, is_plausible ? PLAUSIBLE_DEVINFO : answer.m_rest_a);
    stand_in_record("create_devinfo(out, %d) = %d [%d characters]", capacity, status, length);
    return status;
}

STAND_IN_INTERFACE int32_t enter_idle(void)
{
    return stand_in_answer_call(AMT_MISC_HAL_ENTER_IDLE, "");
}

STAND_IN_INTERFACE int32_t amt_usb_charger_enable(int32_t mode)
{
    char arguments_a[16];
    snprintf(arguments_a, sizeof(arguments_a), "%d", mode);
    return stand_in_answer_call(AMT_MISC_HAL_USB_CHARGER_ENABLE, arguments_a);
}

STAND_IN_INTERFACE int32_t amt_check_system_sanity(void)
{
    return stand_in_answer_call(AMT_MISC_HAL_CHECK_SANITY, "");
}
