#pragma once

#include <stdint.h>

/*
 * Size, used and available space in KiB of the file system mounted at mount_point, each cut to 32 bits; used
 * and available are counted as an unprivileged user sees them. An absent output is left out, but one must be
 * there. A file system counts as mounted when a line of /proc/mounts contains mount_point anywhere.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_NOT_FOUND when it is not mounted, PUB_ERR_FILE when it cannot be asked,
 * PUB_ERR_PARAM for an absent or empty mount point or when no output is given.
 */
int pub_util_get_mount_fs_info(const char *mount_point, uint32_t *total_ptr, uint32_t *used_ptr,
                               uint32_t *available_ptr);
