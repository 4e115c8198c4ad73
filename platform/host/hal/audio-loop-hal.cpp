#include "platform/include/audio-loop-hal.h"

#include <stdio.h>

#include "platform/host/stand-in/stand-in.h"

STAND_IN_INTERFACE int32_t codec_loop_test(int32_t type, int32_t enable);

STAND_IN_INTERFACE int32_t codec_loop_test(int32_t type, int32_t enable)
{
    char arguments_a[32];
    snprintf(arguments_a, sizeof(arguments_a), "%d, %d", type, enable);
    return stand_in_answer_call(AUDIO_LOOP_HAL_CODEC_LOOP_TEST, arguments_a);
}
