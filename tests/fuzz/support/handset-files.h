#pragma once

#include <stdint.h>
#include <string>

/*
 * The handset's factory files, kept in memory: in a target that is linked with this, what the daemon's code opens
 * below /amt, /data, /mnt, /sys and /system is one of these files, and no program runs, no time passes and nobody
 * powers the machine off. Everything else is the machine's own.
 */

/* From here on, until its end, the files are there; at first none. The engine's own calls come before and behind. */
void handset_files_begin();
void handset_files_end();

/* Makes a file, or replaces one. */
void handset_files_put(const std::string &path, const std::string &content);

/* Whether there is such a file; its content goes to *content_ptr. */
bool handset_files_get(const std::string &path, std::string *content_ptr);

/* Called in place of every pause, with its milliseconds; null: nothing is. */
void handset_files_set_pause(void (*pause)(uint32_t ms));

/* How often the power was switched off. */
uint32_t handset_files_power_offs();
