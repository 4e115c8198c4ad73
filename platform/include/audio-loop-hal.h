/*
 * The test entry of the platform's audio HAL. It is loaded when needed, so what is named here are its path
 * and the name and shape of the entry, which has C linkage.
 */
#pragma once

#include <stdint.h>

#define AUDIO_LOOP_HAL_LIBRARY         "/system/lib/hw/audio.primary.tq5530.amt.so"
#define AUDIO_LOOP_HAL_CODEC_LOOP_TEST "codec_loop_test"

/* Switches the codec's microphone loop of the given type on (enable 1) or off (0). The result says nothing.
 */
typedef int32_t (*audio_loop_hal_codec_loop_test_func)(int32_t type, int32_t enable);
