#pragma once

#include <stdint.h>

/* The on/off switch of several device requests: 1 start or open, 0 stop or close; 1 when it is missing. */
constexpr uint8_t AMT_ATOM_SWITCH = 15;
