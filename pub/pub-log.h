#pragma once

#include "pub/log/log.h"

/* The library's log sources: what the error lines name. */
inline constexpr pub_log_source_st g_pub_cfg_log{"vx-kel-pub", "cfg/cfg"};
inline constexpr pub_log_source_st g_pub_util_log{"vx-kel-pub", "util/util"};
inline constexpr pub_log_source_st g_pub_pty_log{"vx-kel-pub", "pty/pty"};
