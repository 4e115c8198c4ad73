#pragma once

/* An entry of a hardware-abstraction library, loaded for one call. */
struct amt_hal_entry_st
{
    void *m_library_ptr;
    void *m_entry_ptr;
};

/*
 * Loads the library with lazy binding and looks the entry up. Returns 0, or -118 after the error line of func
 * and the loader's error text. After a failed lookup the library stays loaded, on purpose.
 */
int amt_hal_load(int line, const char *func, const char *path, const char *name, amt_hal_entry_st *entry_ptr);
#define AMT_HAL_LOAD(path, name, entry_ptr) amt_hal_load(__LINE__, __func__, path, name, entry_ptr)

/* Unloads what amt_hal_load has loaded. */
void amt_hal_unload(amt_hal_entry_st *entry_ptr);
