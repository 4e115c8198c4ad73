#include "amt/amt-device/device-file.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>

#include "amt/amt-device/device-fail.h"
#include "amt/amt-device/number-scan.h"
#include "pub/error.h"

namespace {

FILE *open_file(int line, const char *func, const char *path, const char *mode)
{
    FILE *stream = fopen(path, mode);
    if (stream == nullptr) {
        amt_device_fail(g_amt_device_log, line, func, PUB_ERR_FILE, "Open file \"%s\" fail: %d - %s", path,
                        errno, strerror(errno));
    }
    return stream;
}

} // namespace

int amt_device_file_read_int(int line, const char *func, const char *path, int32_t *value_ptr)
{
    FILE *stream = open_file(line, func, path, "re");
    if (stream == nullptr) {
        return PUB_ERR_FILE;
    }
    errno = 0;
    const int count = amt_number_scan_int(stream, value_ptr);
    if (count != 1) {
        amt_device_fail(g_amt_device_log, line, func, PUB_ERR_FILE, "fscanf() return: %d; %d - %s", count,
                        errno, strerror(errno));
    }
    fclose(stream);
    return count == 1 ? PUB_ERR_NONE : PUB_ERR_FILE;
}

int amt_device_file_write_int(int line, const char *func, const char *path, int32_t value)
{
    FILE *stream = open_file(line, func, path, "we");
    if (stream == nullptr) {
        return PUB_ERR_FILE;
    }
    /* Unbuffered: the driver refuses a value in the write itself, not when the file is closed. */
    setvbuf(stream, nullptr, _IONBF, 0);
    const int count = fprintf(stream, "%d", value);
    if (count <= 0) {
        amt_device_fail(g_amt_device_log, line, func, PUB_ERR_FILE, "fprintf() return: %d; %d - %s", count,
                        errno, strerror(errno));
    }
    fclose(stream);
    return count > 0 ? PUB_ERR_NONE : PUB_ERR_FILE;
}
