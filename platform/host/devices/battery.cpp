#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include "platform/host/stand-in/stand-in.h"

/*
 * The battery driver's file. A shell writes a request into it, so the file keeps what was last written; a
 * read after "amt_get_vbatt" must give the raw ADC value instead, which is why opening it for reading is
 * answered here.
 */

namespace {

constexpr char DRIVER_PATH[] = "/proc/driver/sarvo_battery";
constexpr char ADC_REQUEST[] = "amt_get_vbatt";
constexpr char DEFAULT_ADC[] = "3700";
constexpr uint32_t TEXT_SIZE = 128;

typedef FILE *(*fopen_func)(const char *path, const char *mode);

bool is_adc_read(const char *path, const char *mode)
{
    if (strcmp(path, DRIVER_PATH) != 0 || mode[0] != 'r' || strchr(mode, '+') != nullptr ||
        stand_in_setting(STAND_IN_DEVICES) == nullptr)
    {
        return false;
    }
    char text_a[TEXT_SIZE];
    return stand_in_read_file(path, text_a, sizeof(text_a)) > 0 && strstr(text_a, ADC_REQUEST) != nullptr;
}

/* The driver's answer: scripted, or the number in the file "battery-adc", or the default. */
void adc_text(const stand_in_answer_st &answer, char *text, uint32_t capacity)
{
    char path_a[STAND_IN_PATH_SIZE];
    if (answer.m_rest_a[0] != '\0') {
        snprintf(text, capacity, "%s", answer.m_rest_a);
    } else if (!stand_in_path(path_a, STAND_IN_DEVICES, "battery-adc") ||
               stand_in_read_file(path_a, text, capacity) <= 0)
    {
        snprintf(text, capacity, "%s", DEFAULT_ADC);
    }
    text[strcspn(text, "\n")] = '\0';
}

/* A stream to read the text from. */
FILE *open_text(const char *text)
{
    const int fd = memfd_create("sarvo_battery", MFD_CLOEXEC);
    if (fd < 0) {
        return nullptr;
    }
    const bool is_written = dprintf(fd, "%s\n", text) > 0 && lseek(fd, 0, SEEK_SET) == 0;
    FILE *stream = is_written ? fdopen(fd, "r") : nullptr;
    if (stream == nullptr) {
        close(fd);
    }
    return stream;
}

FILE *answer_adc_read()
{
    stand_in_answer_st answer;
    const int32_t status = stand_in_take_answer("sarvo_battery", &answer);
    if (status < 0) {
        const int32_t error = stand_in_error_number(&answer, EIO);
        stand_in_record("fopen(sarvo_battery) = -1 %s", strerrorname_np(error));
        errno = error;
        return nullptr;
    }
    char text_a[TEXT_SIZE];
    adc_text(answer, text_a, sizeof(text_a));
    stand_in_record("fopen(sarvo_battery) = 0 [%s]", text_a);
    return open_text(text_a);
}

FILE *open_file(const char *path, const char *mode, fopen_func next)
{
    const int saved_errno = errno;
    const bool is_adc = is_adc_read(path, mode);
    errno = saved_errno;
    return is_adc ? answer_adc_read() : next(path, mode);
}

} // namespace

STAND_IN_INTERFACE FILE *fopen(const char *path, const char *mode)
{
    static const fopen_func next = reinterpret_cast<fopen_func>(dlsym(RTLD_NEXT, "fopen"));
    return open_file(path, mode, next);
}

STAND_IN_INTERFACE FILE *fopen64(const char *path, const char *mode)
{
    static const fopen_func next = reinterpret_cast<fopen_func>(dlsym(RTLD_NEXT, "fopen64"));
    return open_file(path, mode, next);
}
