#include "amt/amt-device/hal-library.h"

#include <dlfcn.h>

#include "amt/amt-device/device-fail.h"
#include "pub/error.h"

namespace {

int fail_load(int line, const char *func)
{
    const char *text = dlerror();
    const int status = amt_device_fail(g_amt_device_log, line, func, PUB_ERR_FILE, "call dlopen fail: - %s",
                                       text == nullptr ? "" : text);
    /* Lets go of the text now: at the thread's end that would happen inside a signal handler. */
    dlerror();
    return status;
}

} // namespace

int amt_hal_load(int line, const char *func, const char *path, const char *name, amt_hal_entry_st *entry_ptr)
{
    entry_ptr->m_library_ptr = dlopen(path, RTLD_LAZY);
    if (entry_ptr->m_library_ptr == nullptr) {
        return fail_load(line, func);
    }
    entry_ptr->m_entry_ptr = dlsym(entry_ptr->m_library_ptr, name);
    return entry_ptr->m_entry_ptr == nullptr ? fail_load(line, func) : PUB_ERR_NONE;
}

void amt_hal_unload(amt_hal_entry_st *entry_ptr)
{
    dlclose(entry_ptr->m_library_ptr);
    *entry_ptr = {};
}
