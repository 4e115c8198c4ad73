#include "platform/host/devices/device.h"

#include "platform/include/device-requests.h"

namespace {

device_value_st g_value_a[] = {{"mode", KD_TEXT}};

const device_request_st g_request_a[] = {
    {KDSETMODE, "KDSETMODE", DEVICE_ARGUMENT_VALUE, 0, KD_GRAPHICS, nullptr},
};

device_st g_device = {DEVICE_CONSOLE_PATH, "tty0", "console", g_value_a, 1, g_request_a, 1};

} // namespace

device_st *device_console()
{
    return &g_device;
}
