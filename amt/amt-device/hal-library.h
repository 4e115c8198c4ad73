#pragma once

#include "amt/amt-log.h"

/* An entry of a hardware-abstraction library, loaded for one call. */
struct amt_hal_entry_st
{
    void *m_library_ptr;
    void *m_entry_ptr;
};

/*
 * Loads the library with lazy binding and looks the entry up. Returns 0, or PUB_ERR_FILE after the error line
 * of the place and the loader's error text. After a failed lookup the library stays loaded, on purpose.
 */
int amt_hal_load(const char *path, const char *name, amt_hal_entry_st *entry_ptr,
                 const pub_log_place_st &place = g_amt_device_log);

/* Unloads what amt_hal_load has loaded. */
void amt_hal_unload(amt_hal_entry_st *entry_ptr);
