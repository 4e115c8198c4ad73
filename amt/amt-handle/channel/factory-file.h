#pragma once

#include "pub/file/file.h"

/*
 * The one writer of factory files. They must survive a power cut right after the station has got its answer,
 * so every write ends with a flush of the file system.
 */

/*
 * Writes a file that holds the text and the line end, and flushes it; the flush follows a failed write too, but
 * not a failed open. Returns how far it came, with the failing call's errno.
 */
pub_file_step_en amt_factory_file_write(const char *path, const char *text, const char *line_end = "");

/*
 * The flush alone, for a file that was written and closed otherwise: twice a pause of 50 ms and
 * "/system/bin/sync", whose result is ignored. A worker may be ended in the pauses. Preserves errno.
 */
void amt_factory_file_sync();
