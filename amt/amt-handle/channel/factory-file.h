#pragma once

#include "amt/amt-log.h"
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

/* The same with the two lines of a failure at the place. Returns 0 or PUB_ERR_FILE. */
int amt_factory_file_store(const char *path, const char *text,
                           const pub_log_place_st &place = g_amt_handle_log);

/* The lines of a factory file that cannot be opened, with its errno. Returns PUB_ERR_FILE. */
int amt_factory_file_fail_open(const char *path, const pub_log_place_st &place = g_amt_handle_log);

/*
 * The flush alone, for a file that was written and closed otherwise: twice a pause of 50 ms and
 * "/system/bin/sync", whose result is ignored. A worker may be ended in the pauses. Preserves errno.
 */
void amt_factory_file_sync();
