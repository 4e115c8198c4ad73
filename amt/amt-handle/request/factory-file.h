#pragma once

#include <stdint.h>

/* How far the writing of a factory file came. */
enum class amt_factory_step_en : uint8_t
{
    DONE,
    OPEN_FAILED, /* nothing was touched, nothing was flushed */
    WRITE_FAILED /* the file is left truncated; it was flushed all the same */
};

/*
 * Writes a factory file durably: mode "w+", the text as it stands, close, then twice a pause of 50 ms and a sync.
 * errno is the failing call's when the result is not DONE.
 */
amt_factory_step_en amt_factory_file_write(const char *path, const char *text);

/* The flush alone: twice a pause of 50 ms and "/system/bin/sync". */
void amt_factory_file_sync();
