#include "platform/host/devices/device.h"

#include "platform/include/device-requests.h"

namespace {

enum
{
    INPUT,
    PREVIEW,
    SELF_TEST
};

device_value_st g_value_a[] = {{"input", 0}, {"preview", 0}, {"self_test", 0}};

constexpr uint32_t LAST_INPUT = 1;

const device_request_st g_request_a[] = {
    {VIDIOC_S_INPUT, "VIDIOC_S_INPUT", DEVICE_ARGUMENT_INT, INPUT, LAST_INPUT, nullptr},
    {SARVOCAM_IOCTL_PREVIEW, "SARVOCAM_IOCTL_PREVIEW", DEVICE_ARGUMENT_INT, PREVIEW, 1, nullptr},
    {SARVOCAM_IOCTL_SELF_TEST, "SARVOCAM_IOCTL_SELF_TEST", DEVICE_ARGUMENT_INT, SELF_TEST, 1, nullptr},
};

device_st g_device = {DEVICE_CAMERA_PATH,
                      "video0",
                      "camera",
                      g_value_a,
                      sizeof(g_value_a) / sizeof(g_value_a[0]),
                      g_request_a,
                      sizeof(g_request_a) / sizeof(g_request_a[0])};

} // namespace

device_st *device_camera()
{
    return &g_device;
}
