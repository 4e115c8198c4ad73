#include "amt/amt-device/hal-library.h"

#include <dlfcn.h>

#include "pub/error.h"

namespace {

int fail_load(const pub_log_place_st &place)
{
    const char *text = dlerror();
    const int status =
        pub_log_fail(place, PUB_ERR_FILE, "call dlopen fail: - %s", text == nullptr ? "" : text);
    /* Lets go of the text now: at the thread's end that would happen inside a signal handler. */
    dlerror();
    return status;
}

} // namespace

int amt_hal_load(const char *path, const char *name, amt_hal_entry_st *entry_ptr,
                 const pub_log_place_st &place)
{
    entry_ptr->m_library_ptr = dlopen(path, RTLD_LAZY);
    if (entry_ptr->m_library_ptr == nullptr) {
        return fail_load(place);
    }
    entry_ptr->m_entry_ptr = dlsym(entry_ptr->m_library_ptr, name);
    return entry_ptr->m_entry_ptr == nullptr ? fail_load(place) : PUB_ERR_NONE;
}

void amt_hal_unload(amt_hal_entry_st *entry_ptr)
{
    dlclose(entry_ptr->m_library_ptr);
    *entry_ptr = {};
}
