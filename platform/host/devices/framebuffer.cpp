#include "platform/host/devices/device.h"

#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include "platform/include/device-requests.h"

namespace {

enum
{
    XRES,
    YRES,
    XRES_VIRTUAL,
    YRES_VIRTUAL,
    XOFFSET,
    YOFFSET,
    BITS_PER_PIXEL,
    LINE_LENGTH,
    SMEM_LEN,
    LAYER_ENABLED,
    LAYER_FORMAT
};

/* smem_len 0: as long as the file that stands for the node. */
device_value_st g_value_a[] = {
    {"xres", 480},   {"yres", 800},        {"xres_virtual", 480},  {"yres_virtual", 1600},
    {"xoffset", 0},  {"yoffset", 0},       {"bits_per_pixel", 32}, {"line_length", 1920},
    {"smem_len", 0}, {"layer_enabled", 1}, {"layer_format", 0},
};

uint32_t memory_length(const device_st *device, int fd)
{
    struct stat state;
    const uint32_t length = device->m_value_ptr[SMEM_LEN].m_value;
    return length == 0 && fstat(fd, &state) == 0 ? static_cast<uint32_t>(state.st_size) : length;
}

int32_t get_fixed(device_st *device, int fd, void *argument)
{
    fb_fix_screeninfo *info = static_cast<fb_fix_screeninfo *>(argument);
    memset(info, 0, sizeof(*info));
    memcpy(info->id, "sarvofb", sizeof("sarvofb"));
    info->type = FB_TYPE_PACKED_PIXELS;
    info->visual = FB_VISUAL_TRUECOLOR;
    info->ypanstep = 1;
    info->line_length = device->m_value_ptr[LINE_LENGTH].m_value;
    info->smem_len = memory_length(device, fd);
    return 0;
}

void set_colour(fb_bitfield *field, uint32_t offset, uint32_t length)
{
    field->offset = offset;
    field->length = length;
}

int32_t get_variable(device_st *device, int, void *argument)
{
    const device_value_st *value = device->m_value_ptr;
    fb_var_screeninfo *info = static_cast<fb_var_screeninfo *>(argument);
    memset(info, 0, sizeof(*info));
    info->xres = value[XRES].m_value;
    info->yres = value[YRES].m_value;
    info->xres_virtual = value[XRES_VIRTUAL].m_value;
    info->yres_virtual = value[YRES_VIRTUAL].m_value;
    info->xoffset = value[XOFFSET].m_value;
    info->yoffset = value[YOFFSET].m_value;
    info->bits_per_pixel = value[BITS_PER_PIXEL].m_value;
    const bool is_16_bit = info->bits_per_pixel == 16;
    set_colour(&info->red, is_16_bit ? 11 : 16, is_16_bit ? 5 : 8);
    set_colour(&info->green, is_16_bit ? 5 : 8, is_16_bit ? 6 : 8);
    set_colour(&info->blue, 0, is_16_bit ? 5 : 8);
    return 0;
}

/* The panel's resolution is fixed; the visible page must lie inside the virtual screen. */
int32_t put_variable(device_st *device, int, void *argument)
{
    device_value_st *value = device->m_value_ptr;
    const fb_var_screeninfo *info = static_cast<const fb_var_screeninfo *>(argument);
    const bool is_panel = info->xres == value[XRES].m_value && info->yres == value[YRES].m_value;
    const bool is_depth = info->bits_per_pixel == 16 || info->bits_per_pixel == 32;
    const bool is_inside = uint64_t{info->yoffset} + info->yres <= info->yres_virtual &&
                           uint64_t{info->xoffset} + info->xres <= info->xres_virtual;
    if (!is_panel || !is_depth || !is_inside) {
        return -EINVAL;
    }
    value[XRES_VIRTUAL].m_value = info->xres_virtual;
    value[YRES_VIRTUAL].m_value = info->yres_virtual;
    value[XOFFSET].m_value = info->xoffset;
    value[YOFFSET].m_value = info->yoffset;
    value[BITS_PER_PIXEL].m_value = info->bits_per_pixel;
    return 0;
}

constexpr uint32_t FORMAT_LIMIT = 255;

const device_request_st g_request_a[] = {
    {FBIOGET_FSCREENINFO, "FBIOGET_FSCREENINFO", DEVICE_ARGUMENT_OUT, DEVICE_NO_VALUE, 0, get_fixed},
    {FBIOGET_VSCREENINFO, "FBIOGET_VSCREENINFO", DEVICE_ARGUMENT_OUT, DEVICE_NO_VALUE, 0, get_variable},
    {FBIOPUT_VSCREENINFO, "FBIOPUT_VSCREENINFO", DEVICE_ARGUMENT_SCREEN, DEVICE_NO_VALUE, 0, put_variable},
    {SARVOFB_IOCTL_EN_LAYER, "SARVOFB_IOCTL_EN_LAYER", DEVICE_ARGUMENT_VALUE, LAYER_ENABLED, 1, nullptr},
    {SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT, "SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT", DEVICE_ARGUMENT_VALUE,
     LAYER_FORMAT, FORMAT_LIMIT, nullptr},
};

device_st g_device = {DEVICE_FRAMEBUFFER_PATH,
                      "fb0",
                      "framebuffer",
                      g_value_a,
                      sizeof(g_value_a) / sizeof(g_value_a[0]),
                      g_request_a,
                      sizeof(g_request_a) / sizeof(g_request_a[0])};

} // namespace

device_st *device_framebuffer()
{
    return &g_device;
}
