#include "amt/amt-device/device-file.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>

#include "pub/error.h"
#include "pub/file/scan.h"

namespace {

int fail_open(const char *path, const pub_log_place_st &place)
{
    return pub_log_fail(place, PUB_ERR_FILE, "Open file \"%s\" fail: %d - %s", path, errno, strerror(errno));
}

} // namespace

int amt_device_file_read_int(const char *path, int32_t *value_ptr, const pub_log_place_st &place)
{
    const pub_file_st file(path, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return fail_open(path, place);
    }
    const int count = pub_file_scan_int(file, value_ptr);
    if (count != 1) {
        pub_log_fail(place, PUB_ERR_FILE, "fscanf() return: %d; %d - %s", count, errno, strerror(errno));
    }
    return count == 1 ? PUB_ERR_NONE : PUB_ERR_FILE;
}

int amt_device_file_write_int(const char *path, int32_t value, const pub_log_place_st &place)
{
    const pub_file_st file(path, pub_file_mode_en::WRITE);
    if (!file.is_open()) {
        return fail_open(path, place);
    }
    /* Unbuffered: the driver refuses a value in the write itself, not when the file is closed. */
    setvbuf(file.m_stream_ptr, nullptr, _IONBF, 0);
    const int count = fprintf(file.m_stream_ptr, "%d", value);
    if (count <= 0) {
        pub_log_fail(place, PUB_ERR_FILE, "fprintf() return: %d; %d - %s", count, errno, strerror(errno));
    }
    return count > 0 ? PUB_ERR_NONE : PUB_ERR_FILE;
}
