#pragma once

#include <stdint.h>

/*
 * The one writer of factory files. They must survive a power cut right after the station has got its answer,
 * so every write ends with a flush of the file system.
 */

/* How far the writing of a factory file came. */
enum class amt_factory_step_en : uint8_t
{
    DONE,
    OPEN_FAILED, /* nothing was touched, nothing is to be flushed */
    WRITE_FAILED /* the file is left truncated; it is flushed all the same */
};

/*
 * Writes a factory file durably: mode "w+", the text and the line end as they stand, close, then twice a
 * pause of 50 ms and a sync. errno is the failing call's when the result is not DONE.
 */
amt_factory_step_en amt_factory_file_write(const char *path, const char *text, const char *line_end = "");

/*
 * The same without the flush, for a caller that has something to do or to log between the two: unless the
 * result is OPEN_FAILED, it calls amt_factory_file_sync afterwards.
 */
amt_factory_step_en amt_factory_file_put(const char *path, const char *text, const char *line_end = "");

/* The flush alone: twice a pause of 50 ms and "/system/bin/sync", whose result is ignored. Preserves errno.
 */
void amt_factory_file_sync();
