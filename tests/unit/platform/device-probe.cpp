#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <termios.h>
#include <unistd.h>

#include "platform/include/device-requests.h"

/*
 * Does what its arguments say, one line of output each: PATH:REQUEST[=VALUE] issues a request on a file,
 * read:PATH reads the first word of a file, the way the daemon does both.
 */

namespace {

enum argument_kind
{
    BY_VALUE,
    BY_POINTER,
    PAN,
    FIXED,
    VARIABLE,
    NOTHING,
    WINDOW_SIZE
};

struct request_st
{
    const char *m_name_ptr;
    unsigned long m_number;
    argument_kind m_kind;
};

constexpr request_st request_a[] = {
    {"KDSETMODE", KDSETMODE, BY_VALUE},
    {"EN_LAYER", SARVOFB_IOCTL_EN_LAYER, BY_VALUE},
    {"SET_FORMAT", SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT, BY_VALUE},
    {"S_INPUT", VIDIOC_S_INPUT, BY_POINTER},
    {"PREVIEW", SARVOCAM_IOCTL_PREVIEW, BY_POINTER},
    {"SELF_TEST", SARVOCAM_IOCTL_SELF_TEST, BY_POINTER},
    {"FIXED", FBIOGET_FSCREENINFO, FIXED},
    {"VARIABLE", FBIOGET_VSCREENINFO, VARIABLE},
    {"PAN", FBIOPUT_VSCREENINFO, PAN},
    {"NULL", FBIOGET_FSCREENINFO, NOTHING},
    {"WINDOW_SIZE", TIOCGWINSZ, WINDOW_SIZE},
};

int issue(int fd, const request_st &request, int value)
{
    fb_fix_screeninfo fixed = {};
    fb_var_screeninfo variable = {};
    struct winsize size = {};
    int result = 0;
    switch (request.m_kind) {
    case BY_VALUE:
        return ioctl(fd, request.m_number, value);
    case BY_POINTER:
        return ioctl(fd, request.m_number, &value);
    case NOTHING:
        return ioctl(fd, request.m_number, nullptr);
    case WINDOW_SIZE:
        return ioctl(fd, request.m_number, &size);
    case FIXED:
        result = ioctl(fd, request.m_number, &fixed);
        printf("smem_len=%u line_length=%u ", fixed.smem_len, fixed.line_length);
        return result;
    case VARIABLE:
        result = ioctl(fd, request.m_number, &variable);
        printf("%ux%u virtual %u offset %u depth %u ", variable.xres, variable.yres, variable.yres_virtual,
               variable.yoffset, variable.bits_per_pixel);
        return result;
    case PAN:
        ioctl(fd, FBIOGET_VSCREENINFO, &variable);
        variable.yres_virtual = 2 * variable.yres;
        variable.bits_per_pixel = 16;
        variable.yoffset = static_cast<uint32_t>(value);
        return ioctl(fd, request.m_number, &variable);
    }
    return 0;
}

void print_result(int result)
{
    const int error = errno;
    result < 0 ? printf("%d %s\n", result, strerrorname_np(error)) : printf("%d\n", result);
}

void run_request(char *step)
{
    char *name = strchr(step, ':');
    *name++ = '\0';
    char *value = strchr(name, '=');
    if (value != nullptr) {
        *value++ = '\0';
    }
    const int fd = open(step, O_RDWR);
    for (const request_st &request : request_a) {
        if (strcmp(request.m_name_ptr, name) == 0) {
            errno = 0;
            print_result(
                issue(fd, request, value != nullptr ? static_cast<int>(strtol(value, nullptr, 0)) : 0));
        }
    }
    close(fd);
}

void run_read(const char *path)
{
    errno = 0;
    FILE *stream = fopen(path, "r");
    if (stream == nullptr) {
        printf("no file %s\n", strerrorname_np(errno));
        return;
    }
    char word_a[64] = "nothing";
    const int count = fscanf(stream, "%63s", word_a);
    printf("%d %s\n", count, word_a);
    fclose(stream);
}

} // namespace

int main(int argc, char **argv)
{
    for (int i = 1; i < argc; i++) {
        if (strncmp(argv[i], "read:", 5) == 0) {
            run_read(argv[i] + 5);
        } else {
            run_request(argv[i]);
        }
        fflush(stdout);
    }
    return 0;
}
