#include "pub/util/mount.h"

#include <string.h>
#include <sys/statfs.h>

#include "pub/cfg/cfg.h"
#include "pub/error.h"
#include "pub/file/file.h"
#include "pub/pub-log.h"

namespace {

constexpr uint32_t LINE_SIZE = 200;

/* Whether a line of the list of mounts contains the text. */
bool is_listed(const pub_file_st &mounts, const char *text)
{
    char line_a[LINE_SIZE + 1] = {}; /* one more zero byte behind a line that fills the rest */
    uint32_t length = 0;
    int is_eof = 0;
    while (is_eof == 0) {
        pub_cfg_get_line(mounts.m_stream_ptr, line_a, LINE_SIZE, &length, &is_eof);
        if (strstr(line_a, text) != nullptr) {
            return true;
        }
    }
    return false;
}

void store_kib(uint32_t *out_ptr, uint64_t block_size, uint64_t blocks)
{
    if (out_ptr != nullptr) {
        *out_ptr = static_cast<uint32_t>(block_size * blocks / 1024);
    }
}

} // namespace

int pub_util_get_mount_fs_info(const char *mount_point, uint32_t *total_ptr, uint32_t *used_ptr,
                               uint32_t *available_ptr)
{
    pub_log_entry(g_pub_util_log);
    const bool has_no_output = total_ptr == nullptr && used_ptr == nullptr && available_ptr == nullptr;
    if (mount_point == nullptr || *mount_point == '\0' || has_no_output) {
        return pub_log_bad_param(
            g_pub_util_log,
            {mount_point == nullptr, mount_point != nullptr && *mount_point == '\0', has_no_output});
    }

    bool is_mounted = false;
    const pub_file_st mounts("/proc/mounts", pub_file_mode_en::READ);
    if (mounts.is_open()) {
        is_mounted = is_listed(mounts, mount_point);
    } else {
        pub_log_call_error(g_pub_util_log, "fopen", PUB_ERR_SYS_CALL);
    }
    if (!is_mounted) {
        return pub_log_fail(g_pub_util_log, PUB_ERR_NOT_FOUND, "file system \"%s\" has not been mounted",
                            mount_point);
    }

    struct statfs64 info = {};
    if (statfs64(mount_point, &info) != 0) {
        pub_log_call_error(g_pub_util_log, "statfs", PUB_ERR_SYS_CALL);
        return PUB_ERR_FILE;
    }
    const uint64_t block_size = static_cast<uint64_t>(info.f_bsize);
    store_kib(total_ptr, block_size, info.f_blocks);
    store_kib(used_ptr, block_size, info.f_blocks - info.f_bavail);
    store_kib(available_ptr, block_size, info.f_bavail);
    return PUB_ERR_NONE;
}
