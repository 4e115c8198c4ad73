#include "amt/amt-handle/request/factory-file.h"

#include <errno.h>
#include <stdio.h>
#include <stdlib.h>

#include "pub/util/thread-end.h"

static constexpr int FLUSH_COUNT = 2;
static constexpr uint32_t FLUSH_PAUSE_MS = 50;
static constexpr const char *SYNC_COMMAND = "/system/bin/sync";

/* Flushes the stream too: a full file system shows when the text leaves the stream, not when it enters it. */
static bool put_text(FILE *stream, const char *text, const char *line_end)
{
    return fputs(text, stream) != EOF && fputs(line_end, stream) != EOF && fflush(stream) == 0;
}

amt_factory_step_en amt_factory_file_put(const char *path, const char *text, const char *line_end)
{
    FILE *const stream = fopen(path, "w+");
    if (stream == nullptr) {
        return amt_factory_step_en::OPEN_FAILED;
    }
    const bool is_written = put_text(stream, text, line_end);
    const int write_errno = errno;
    fclose(stream);
    errno = write_errno;
    return is_written ? amt_factory_step_en::DONE : amt_factory_step_en::WRITE_FAILED;
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
        const int ignored_status = system(SYNC_COMMAND);
        static_cast<void>(ignored_status);
    }
    errno = saved_errno;
}
