#include "amt/amt-handle/reader/reader.h"

#include <sys/resource.h>
#include <time.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/worker.h"
#include "tests/unit/support/log-capture.h"

namespace {

constexpr unsigned int WATCH_US = 300000;
constexpr clock_t BUSY_LIMIT = CLOCKS_PER_SEC / 10;

/* Tells this end of the process from the one that the monitor makes. */
constexpr int SEEN = 64;

/* Runs the monitor where no socket can be had; it must neither spin nor be beyond a stop's reach. */
[[noreturn]] void monitor_without_a_socket()
{
    const rlimit none = {0, 0};
    setrlimit(RLIMIT_NOFILE, &none);
    g_handle_state.m_usb_state = amt_usb_en::UNKNOWN;
    const log_capture_c capture;
    const clock_t begin = clock();
    amt_worker_start(&g_handle_context.m_usb_monitor, amt_handle_monitor_usb_loop);
    usleep(WATCH_US);
    const bool is_busy = clock() - begin > BUSY_LIMIT;
    const bool is_alive = g_handle_context.m_usb_monitor.m_is_alive != 0;
    amt_worker_stop(&g_handle_context.m_usb_monitor);
    const bool is_stopped = g_handle_context.m_usb_monitor.m_is_alive == 0;
    _exit(SEEN + (is_busy ? 1 : 0) + (is_alive ? 0 : 2) + (is_stopped ? 0 : 4));
}

/* Runs the monitor until it finds the link disconnected, which ends the process. */
[[noreturn]] void monitor_a_disconnected_link()
{
    g_handle_state.m_usb_state = amt_usb_en::DISCONNECTED;
    g_usb_activate = 0;
    amt_worker_start(&g_handle_context.m_usb_monitor, amt_handle_monitor_usb_loop);
    for (;;) {
        pause();
    }
}

TEST(usb_monitor, without_a_socket_waits)
{
    EXPECT_EXIT(monitor_without_a_socket(), testing::ExitedWithCode(SEEN), "");
}

TEST(usb_monitor, of_a_disconnected_link_ends_the_process)
{
    EXPECT_EXIT(monitor_a_disconnected_link(), testing::ExitedWithCode(0), "");
}

} // namespace
