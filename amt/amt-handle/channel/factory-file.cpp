#include "amt/amt-handle/channel/factory-file.h"

#include <errno.h>
#include <string.h>

#include "pub/error.h"
#include "pub/util/process.h"
#include "pub/util/thread-end.h"

namespace {

constexpr int FLUSH_COUNT = 2;
constexpr uint32_t FLUSH_PAUSE_MS = 50;
constexpr const char *SYNC_COMMAND = "/system/bin/sync";

} // namespace

pub_file_step_en amt_factory_file_write(const char *path, const char *text, const char *line_end)
{
    const pub_file_step_en step = pub_file_write(path, text, line_end);
    if (step != pub_file_step_en::OPEN_FAILED) {
        amt_factory_file_sync();
    }
    return step;
}

int amt_factory_file_store(const char *path, const char *text, const pub_log_place_st &place)
{
    const pub_file_step_en step = amt_factory_file_write(path, text);
    if (step == pub_file_step_en::OPEN_FAILED) {
        return amt_factory_file_fail_open(path, place);
    }
    return step == pub_file_step_en::DONE
               ? PUB_ERR_NONE
               : pub_log_fail(place, PUB_ERR_FILE, "fputs fail: %d - %s", errno, strerror(errno));
}

int amt_factory_file_fail_open(const char *path, const pub_log_place_st &place)
{
    return pub_log_fail(place, PUB_ERR_FILE, "open(\"%s\") fail: %d - %s", path, errno, strerror(errno));
}

void amt_factory_file_sync()
{
    const int saved_errno = errno;
    for (int i = 0; i < FLUSH_COUNT; i++) {
        pub_util_sleep_ms(FLUSH_PAUSE_MS);
        pub_util_run_shell(SYNC_COMMAND);
    }
    errno = saved_errno;
}
