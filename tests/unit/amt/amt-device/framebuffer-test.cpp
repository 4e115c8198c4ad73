#include "amt/amt-device/framebuffer.h"

#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <stdarg.h>
#include <string.h>
#include <string>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <unistd.h>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/include/device-requests.h"
#include "tests/unit/support/log-capture.h"

/*
 * What a process does that shows the picture more than once: on a handset that is one handshake a start, so
 * the system's tests cannot see it. While a screen of this file lives, it answers for the framebuffer's node.
 */
namespace {

using testing::ElementsAre;
using testing::ExitedWithCode;
using testing::IsEmpty;

constexpr uint32_t WIDTH = 360;
constexpr uint32_t HEIGHT = 400;
constexpr uint32_t PAGE_STEP = WIDTH * HEIGHT * 4;
constexpr uint32_t MEMORY_SIZE = 2 * PAGE_STEP;

struct screen_st
{
    int m_fd = memfd_create("screen", MFD_CLOEXEC);
    int m_opened_fd = -1;
    uint32_t m_y_offset = 0;
    unsigned long m_refused = 0; /* the request that fails */
    int m_passed = 0;            /* how often it still succeeds */
    std::vector<std::string> m_requests;

    screen_st();
    ~screen_st();

    std::vector<std::string> take_requests()
    {
        std::vector<std::string> taken;
        taken.swap(m_requests);
        return taken;
    }

    void refuse(unsigned long request, int passed)
    {
        m_refused = request;
        m_passed = passed;
    }

    uint8_t first_byte_of_picture(uint32_t y_offset) const
    {
        const off_t left = (WIDTH - AMT_PICTURE_WIDTH) / 2;
        const off_t top = (HEIGHT - AMT_PICTURE_HEIGHT) / 2;
        uint8_t byte = 0;
        EXPECT_EQ(
            pread(m_fd, &byte, 1, static_cast<off_t>(y_offset) * WIDTH * 4 + (left + top * off_t{WIDTH}) * 2),
            1);
        return byte;
    }

    int answer(unsigned long request, void *argument);
};

screen_st *g_screen = nullptr;

screen_st::screen_st()
{
    EXPECT_EQ(ftruncate(m_fd, MEMORY_SIZE), 0);
    g_screen = this;
}

screen_st::~screen_st()
{
    g_screen = nullptr;
    close(m_fd);
}

std::string describe(unsigned long request, const void *argument)
{
    const std::string value = std::to_string(reinterpret_cast<uintptr_t>(argument));
    switch (request) {
    case FBIOGET_FSCREENINFO:
        return "fixed";
    case FBIOGET_VSCREENINFO:
        return "variable";
    case FBIOPUT_VSCREENINFO: {
        const fb_var_screeninfo *info = static_cast<const fb_var_screeninfo *>(argument);
        return "pan " + std::to_string(info->yoffset) + " of " + std::to_string(info->yres_virtual) + " at " +
               std::to_string(info->bits_per_pixel);
    }
    case SARVOFB_IOCTL_EN_LAYER:
        return "layer " + value;
    case SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT:
        return "format " + value;
    default:
        return "other";
    }
}

int screen_st::answer(unsigned long request, void *argument)
{
    m_requests.push_back(describe(request, argument));
    if (request == m_refused && m_passed-- <= 0) {
        errno = EIO;
        return -1;
    }
    if (request == FBIOGET_FSCREENINFO) {
        fb_fix_screeninfo info = {};
        info.smem_len = MEMORY_SIZE;
        memcpy(argument, &info, sizeof(info));
    } else if (request == FBIOGET_VSCREENINFO) {
        fb_var_screeninfo info = {};
        info.xres = WIDTH;
        info.yres = HEIGHT;
        info.yoffset = m_y_offset;
        info.bits_per_pixel = 32;
        memcpy(argument, &info, sizeof(info));
    } else if (request == FBIOPUT_VSCREENINFO) {
        m_y_offset = static_cast<const fb_var_screeninfo *>(argument)->yoffset;
    }
    return 0;
}

/* A picture of one byte all over. */
std::vector<uint8_t> plain_picture(uint8_t byte)
{
    return std::vector<uint8_t>(AMT_PICTURE_SIZE, byte);
}

int show(uint8_t byte)
{
    return amt_framebuffer_show(plain_picture(byte).data());
}

constexpr char LAYER_FAILED[] = "fb ioctl SARVOFB_IOCTL_EN_LAYER failed \n";

void expect_first_show_sets_the_layer_up(screen_st *screen_ptr)
{
    EXPECT_EQ(show(0x11), 0);
    EXPECT_THAT(screen_ptr->take_requests(),
                ElementsAre("layer 0", "format 1", "pan 400 of 800 at 16", "layer 1"));
    EXPECT_EQ(screen_ptr->first_byte_of_picture(HEIGHT), 0x11);
}

bool is_screen_mapped()
{
    std::ifstream maps("/proc/self/maps");
    const std::string text{std::istreambuf_iterator<char>(maps), {}};
    return text.find("memfd:screen") != std::string::npos;
}

void expect_later_shows_only_pan(screen_st *screen_ptr)
{
    EXPECT_EQ(show(0x22), 0);
    EXPECT_THAT(screen_ptr->take_requests(), ElementsAre("pan 0 of 800 at 16"));
    EXPECT_EQ(screen_ptr->first_byte_of_picture(0), 0x22);
    EXPECT_EQ(screen_ptr->first_byte_of_picture(HEIGHT), 0x11) << "the other page is left as it was";
    EXPECT_EQ(show(0x33), 0);
    EXPECT_THAT(screen_ptr->take_requests(), ElementsAre("pan 400 of 800 at 16"));
    EXPECT_EQ(screen_ptr->first_byte_of_picture(HEIGHT), 0x33);
}

/* What has failed is tried again from its start by the next show, and counts as never done. */
void expect_failed_set_ups_are_repeated(screen_st *screen_ptr)
{
    screen_ptr->refuse(SARVOFB_IOCTL_EN_LAYER, 0);
    EXPECT_EQ(show(0x01), -1);
    EXPECT_THAT(screen_ptr->take_requests(), ElementsAre("layer 0"));
    screen_ptr->refuse(SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT, 0);
    EXPECT_EQ(show(0x02), -1);
    EXPECT_THAT(screen_ptr->take_requests(), ElementsAre("layer 0", "format 1", "layer 1"));
    EXPECT_EQ(screen_ptr->first_byte_of_picture(HEIGHT), 0x02) << "drawing comes first";

    const log_capture_c capture;
    screen_ptr->refuse(SARVOFB_IOCTL_EN_LAYER, 1);
    EXPECT_EQ(show(0x03), -1);
    EXPECT_THAT(screen_ptr->take_requests(),
                ElementsAre("layer 0", "format 1", "pan 400 of 800 at 16", "layer 1", "layer 1"));
    EXPECT_THAT(capture.texts(), ElementsAre(LAYER_FAILED));
    EXPECT_EQ(capture.records()[0].m_tag, "(null)");
    screen_ptr->refuse(0, 0);
    /* The page was turned all the same. */
    EXPECT_EQ(show(0x04), 0);
    EXPECT_THAT(screen_ptr->take_requests(),
                ElementsAre("layer 0", "format 1", "pan 0 of 800 at 16", "layer 1"));
}

/* Each in a process of its own, because the set-up is remembered as long as a process lives. */
template <typename body_t> void in_a_process(body_t body)
{
    EXPECT_EXIT(
        {
            screen_st screen;
            EXPECT_EQ(amt_framebuffer_open(), 0);
            EXPECT_THAT(screen.take_requests(), ElementsAre("fixed", "variable"));
            body(&screen);
            _exit(testing::Test::HasFailure() ? 1 : 0);
        },
        ExitedWithCode(0), "");
}

TEST(framebuffer, a_second_show_only_pans)
{
    in_a_process([](screen_st *screen_ptr) {
        expect_first_show_sets_the_layer_up(screen_ptr);
        expect_later_shows_only_pan(screen_ptr);
    });
}

TEST(framebuffer, a_failed_set_up_is_repeated)
{
    in_a_process([](screen_st *screen_ptr) { expect_failed_set_ups_are_repeated(screen_ptr); });
}

TEST(framebuffer, the_set_up_outlasts_closing)
{
    in_a_process([](screen_st *screen_ptr) {
        expect_first_show_sets_the_layer_up(screen_ptr);
        EXPECT_TRUE(is_screen_mapped());
        amt_framebuffer_close();
        EXPECT_EQ(fcntl(screen_ptr->m_opened_fd, F_GETFD), -1);
        EXPECT_FALSE(is_screen_mapped());
        EXPECT_EQ(show(0x44), -1) << "it is closed";
        EXPECT_THAT(screen_ptr->take_requests(), IsEmpty());
        const int other_fd = dup(0); /* gets the number that is free now */
        EXPECT_EQ(other_fd, screen_ptr->m_opened_fd);
        amt_framebuffer_close();
        EXPECT_NE(fcntl(other_fd, F_GETFD), -1) << "it is another's now";
        close(other_fd);
        /* The page is what the driver says, not what was shown last. */
        screen_ptr->m_y_offset = 0;
        EXPECT_EQ(amt_framebuffer_open(), 0);
        EXPECT_EQ(show(0x55), 0);
        EXPECT_THAT(screen_ptr->take_requests(), ElementsAre("fixed", "variable", "pan 400 of 800 at 16"));
        EXPECT_EQ(screen_ptr->first_byte_of_picture(HEIGHT), 0x55);
    });
}

/* A page that the driver does not turn to is drawn on again. */
TEST(framebuffer, a_refused_pan_turns_no_page)
{
    in_a_process([](screen_st *screen_ptr) {
        screen_ptr->refuse(FBIOPUT_VSCREENINFO, 0);
        EXPECT_EQ(show(0x66), 0);
        EXPECT_THAT(screen_ptr->take_requests(),
                    ElementsAre("layer 0", "format 1", "pan 400 of 800 at 16", "layer 1"));
        screen_ptr->refuse(0, 0);
        EXPECT_EQ(show(0x77), 0);
        EXPECT_THAT(screen_ptr->take_requests(), ElementsAre("pan 400 of 800 at 16"));
        EXPECT_EQ(screen_ptr->first_byte_of_picture(HEIGHT), 0x77);
        EXPECT_EQ(screen_ptr->first_byte_of_picture(0), 0);
    });
}

TEST(framebuffer, one_that_is_open_is_closed_before_it_is_opened_again)
{
    in_a_process([](screen_st *screen_ptr) {
        const int first_fd = screen_ptr->m_opened_fd;
        EXPECT_EQ(amt_framebuffer_open(), 0);
        EXPECT_EQ(screen_ptr->m_opened_fd, first_fd) << "its number was free again";
    });
}

} // namespace

/* The framebuffer's node is the screen that lives; every other call is the C library's. */
extern "C" int open(const char *path, int flags, ...)
{
    va_list args;
    va_start(args, flags);
    const mode_t mode = (flags & (O_CREAT | __O_TMPFILE)) != 0 ? va_arg(args, mode_t) : 0;
    va_end(args);
    if (g_screen != nullptr && strcmp(path, DEVICE_FRAMEBUFFER_PATH) == 0) {
        g_screen->m_opened_fd = dup(g_screen->m_fd);
        return g_screen->m_opened_fd;
    }
    using open_func = int (*)(const char *, int, ...);
    static const open_func next = reinterpret_cast<open_func>(dlsym(RTLD_NEXT, "open"));
    return next(path, flags, mode);
}

extern "C" int ioctl(int fd, unsigned long request, ...) noexcept
{
    va_list args;
    va_start(args, request);
    void *argument = va_arg(args, void *);
    va_end(args);
    if (g_screen != nullptr && fd == g_screen->m_opened_fd) {
        return g_screen->answer(request, argument);
    }
    using ioctl_func = int (*)(int, unsigned long, ...);
    static const ioctl_func next = reinterpret_cast<ioctl_func>(dlsym(RTLD_NEXT, "ioctl"));
    return next(fd, request, argument);
}
