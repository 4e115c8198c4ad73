#include "amt/amt-handle/channel/service-process.h"

#include <atomic>
#include <sys/types.h>
#include <unistd.h>

namespace {

std::atomic<pid_t> g_service_pid{0};

} // namespace

void amt_service_process_mark()
{
    g_service_pid = getpid();
}

bool amt_service_process_is_own()
{
    const pid_t service_pid = g_service_pid;
    return service_pid == 0 || service_pid == getpid();
}
