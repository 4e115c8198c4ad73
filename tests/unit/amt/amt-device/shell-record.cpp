#include "tests/unit/amt/amt-device/shell-record.h"

#include <dlfcn.h>
#include <errno.h>
#include <stdlib.h>

namespace {

shell_record_c *g_record = nullptr;

} // namespace

shell_record_c::shell_record_c()
{
    g_record = this;
}

shell_record_c::~shell_record_c()
{
    g_record = nullptr;
}

extern "C" int system(const char *command)
{
    if (g_record != nullptr) {
        g_record->m_commands.emplace_back(command);
        if (g_record->m_error != 0) {
            errno = g_record->m_error;
        }
        return g_record->m_answer;
    }
    using system_func = int (*)(const char *);
    static const system_func next = reinterpret_cast<system_func>(dlsym(RTLD_NEXT, "system"));
    return next(command);
}
