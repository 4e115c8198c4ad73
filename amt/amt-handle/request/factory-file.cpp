#include "amt/amt-handle/request/factory-file.h"

#include <errno.h>

#include "pub/file/file.h"
#include "pub/util/process.h"
#include "pub/util/thread-end.h"

namespace {

constexpr int FLUSH_COUNT = 2;
constexpr uint32_t FLUSH_PAUSE_MS = 50;
constexpr const char *SYNC_COMMAND = "/system/bin/sync";

} // namespace

amt_factory_step_en amt_factory_file_put(const char *path, const char *text, const char *line_end)
{
    const pub_file_st file(path, pub_file_mode_en::RENEW);
    if (!file.is_open()) {
        return amt_factory_step_en::OPEN_FAILED;
    }
    return pub_file_put(file, text, line_end) ? amt_factory_step_en::DONE : amt_factory_step_en::WRITE_FAILED;
}

amt_factory_step_en amt_factory_file_write(const char *path, const char *text, const char *line_end)
{
    const amt_factory_step_en step = amt_factory_file_put(path, text, line_end);
    if (step != amt_factory_step_en::OPEN_FAILED) {
        amt_factory_file_sync();
    }
    return step;
}

void amt_factory_file_sync()
{
    const int saved_errno = errno;
    for (int i = 0; i < FLUSH_COUNT; i++) {
        pub_util_sleep_ms(FLUSH_PAUSE_MS);
        const int ignored_status = pub_util_run_shell(SYNC_COMMAND);
        static_cast<void>(ignored_status);
    }
    errno = saved_errno;
}
