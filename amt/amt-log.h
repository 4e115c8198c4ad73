#pragma once

#include "pub/log/log.h"

/* The daemon's log sources: what the error lines name. */
inline constexpr pub_log_source_st g_amt_main_log{"vx-kel-amt", "amt/main"};
inline constexpr pub_log_source_st g_amt_cfg_log{"vx-kel-amt", "amt/amt-cfg"};
inline constexpr pub_log_source_st g_amt_convert_log{"vx-kel-amt", "amt/amt-convert"};
inline constexpr pub_log_source_st g_amt_handle_log{"vx-kel-amt", "amt/amt-handle"};
inline constexpr pub_log_source_st g_amt_device_log{"vx-kel-amt", "amt/amt-device"};
inline constexpr pub_log_source_st g_amt_gps_log{"vx-kel-amt", "amt/amt-gps"};
