#include "amt/amt-device/framebuffer.h"

#include <fcntl.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <unistd.h>

#include "amt/amt-log.h"
#include "platform/include/device-requests.h"

namespace {

constexpr uint32_t PAGE_COUNT = 2;
constexpr uint32_t DEPTH = 16;
constexpr unsigned long LAYER_OFF = 0;
constexpr unsigned long LAYER_ON = 1;
constexpr unsigned long LAYER_FORMAT = 1;

struct framebuffer_st
{
    int m_fd; /* -1 when closed */
    uint8_t *m_memory_ptr;
    fb_fix_screeninfo m_fixed;
    fb_var_screeninfo m_variable;
};

framebuffer_st g_framebuffer = {-1, nullptr, {}, {}};

/* Counts, for the life of the process, how often the display layer has been set up: once is enough. */
int32_t g_layer_enabled_count = 0;

/* Who reads the display's records looks for them without a tag. */
constexpr pub_log_source_st g_display_log{nullptr, ""};

int fail(const char *text)
{
    PUB_LOG(g_display_log, "%s", text);
    return -1;
}

int fail_layer()
{
    return fail("fb ioctl SARVOFB_IOCTL_EN_LAYER failed \n");
}

int fail_mapping()
{
    return fail("fb mapping failed!\n");
}

bool set_layer(unsigned long state)
{
    return ioctl(g_framebuffer.m_fd, SARVOFB_IOCTL_EN_LAYER, state) >= 0;
}

/* The page that is not visible. */
amt_picture_target_st next_page()
{
    const fb_var_screeninfo &variable = g_framebuffer.m_variable;
    const uint32_t y_offset = variable.yoffset == 0 ? variable.yres : 0;
    return {g_framebuffer.m_memory_ptr, g_framebuffer.m_fixed.smem_len, variable.xres, variable.yres,
            y_offset};
}

int read_info()
{
    if (ioctl(g_framebuffer.m_fd, FBIOGET_FSCREENINFO, &g_framebuffer.m_fixed) < 0) {
        return fail("fb ioctl FBIOGET_FSCREENINFO failed \n");
    }
    if (ioctl(g_framebuffer.m_fd, FBIOGET_VSCREENINFO, &g_framebuffer.m_variable) < 0) {
        return fail("fb ioctl FBIOGET_VSCREENINFO failed \n");
    }
    return 0;
}

int map_memory()
{
    void *memory_ptr = mmap(nullptr, g_framebuffer.m_fixed.smem_len, PROT_READ | PROT_WRITE, MAP_SHARED,
                            g_framebuffer.m_fd, 0);
    if (memory_ptr == MAP_FAILED) {
        return fail_mapping();
    }
    g_framebuffer.m_memory_ptr = static_cast<uint8_t *>(memory_ptr);
    return amt_picture_fits(next_page()) ? 0 : fail_mapping();
}

/* Takes the layer off the screen while its format changes. */
int begin_layer_setup()
{
    if (!set_layer(LAYER_OFF)) {
        return fail_layer();
    }
    if (ioctl(g_framebuffer.m_fd, SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT, LAYER_FORMAT) < 0) {
        fail("fb ioctl SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT failed \n");
        set_layer(LAYER_ON);
        return -1;
    }
    return 0;
}

int finish_layer_setup()
{
    if (!set_layer(LAYER_ON)) {
        fail_layer();
        set_layer(LAYER_ON);
        return -1;
    }
    g_layer_enabled_count++;
    return 0;
}

/* Has the driver show the page at y_offset. */
void pan_to(uint32_t y_offset)
{
    fb_var_screeninfo variable = g_framebuffer.m_variable;
    variable.yres_virtual = variable.yres * PAGE_COUNT;
    variable.bits_per_pixel = DEPTH;
    variable.yoffset = y_offset;
    if (ioctl(g_framebuffer.m_fd, FBIOPUT_VSCREENINFO, &variable) >= 0) {
        g_framebuffer.m_variable = variable;
    }
}

} // namespace

void amt_framebuffer_silence_console()
{
    const int fd = open(DEVICE_CONSOLE_PATH, O_RDWR | O_SYNC | O_CLOEXEC);
    if (fd >= 0) {
        ioctl(fd, KDSETMODE, static_cast<unsigned long>(KD_GRAPHICS));
        close(fd);
    }
}

int amt_framebuffer_open()
{
    amt_framebuffer_close();
    g_framebuffer.m_fd = open(DEVICE_FRAMEBUFFER_PATH, O_RDWR | O_CLOEXEC);
    if (g_framebuffer.m_fd < 0) {
        return fail("fb open failed!\n");
    }
    if (read_info() != 0 || map_memory() != 0) {
        amt_framebuffer_close();
        return -1;
    }
    return 0;
}

void amt_framebuffer_close()
{
    if (g_framebuffer.m_memory_ptr != nullptr) {
        munmap(g_framebuffer.m_memory_ptr, g_framebuffer.m_fixed.smem_len);
        g_framebuffer.m_memory_ptr = nullptr;
    }
    if (g_framebuffer.m_fd >= 0) {
        close(g_framebuffer.m_fd);
        g_framebuffer.m_fd = -1;
    }
}

int amt_framebuffer_show(const uint8_t *pixel)
{
    if (g_framebuffer.m_memory_ptr == nullptr) {
        return -1;
    }
    const amt_picture_target_st page = next_page();
    if (!amt_picture_fits(page)) {
        return fail_mapping();
    }
    amt_picture_draw(page, pixel);
    const bool is_first = g_layer_enabled_count == 0;
    if (is_first && begin_layer_setup() != 0) {
        return -1;
    }
    pan_to(page.m_y_offset);
    return is_first ? finish_layer_setup() : 0;
}
