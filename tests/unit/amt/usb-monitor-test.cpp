#include "amt/amt-handle/reader/reader.h"

#include <atomic>
#include <dlfcn.h>
#include <optional>
#include <string>
#include <sys/resource.h>
#include <sys/socket.h>
#include <time.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/worker.h"
#include "tests/unit/support/log-capture.h"

namespace {

constexpr unsigned int WATCH_US = 300000;
constexpr clock_t BUSY_LIMIT = CLOCKS_PER_SEC / 10;

/* Tells this end of the process from the one that the monitor makes. */
constexpr int SEEN = 64;

constexpr int NO_SOCKET = -1;

/* What the monitor gets for its socket, unless NO_SOCKET, and the size of the buffer that it asks for. */
std::atomic<int> g_event_socket{NO_SOCKET};
std::atomic<int> g_buffer_size{0};

/* While it lives, the monitor hears what is sent here instead of the kernel. */
class heard_monitor_c {
public:
    heard_monitor_c()
    {
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_DGRAM, 0, m_fd_a), 0);
        g_event_socket = m_fd_a[0];
        g_buffer_size = 0;
        g_handle_state.m_usb_state = amt_usb_en::UNKNOWN;
        EXPECT_EQ(amt_worker_start(&g_handle_context.m_usb_monitor, amt_handle_monitor_usb_loop), 0);
    }

    ~heard_monitor_c()
    {
        m_capture.reset(); /* it allocates, which the signal that stops a worker must not */
        amt_worker_stop(&g_handle_context.m_usb_monitor);
        while (g_handle_context.m_usb_monitor.m_is_alive != 0) {
            usleep(1000);
        }
        g_event_socket = NO_SOCKET;
        close(m_fd_a[0]);
        close(m_fd_a[1]);
    }

    heard_monitor_c(const heard_monitor_c &) = delete;
    heard_monitor_c &operator=(const heard_monitor_c &) = delete;

    /* Sends an event, and waits until it is logged. */
    void send(const std::string &event)
    {
        const size_t before = texts().size();
        EXPECT_EQ(write(m_fd_a[1], event.data(), event.size()), static_cast<ssize_t>(event.size()));
        for (int i = 0; i < DEADLINE_MS && texts().size() == before; i++) {
            usleep(1000);
        }
    }

    std::vector<std::string> texts() const
    {
        return m_capture->texts();
    }

private:
    static constexpr int DEADLINE_MS = 30000;
    int m_fd_a[2];
    std::optional<log_capture_c> m_capture{std::in_place};
};

std::string heard(const std::string &text)
{
    return "amt_handle_monitor_usb_loop uevent:[" + text + "] nLen:" + std::to_string(text.size());
}

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

TEST(usb_monitor, shows_nothing_of_an_earlier_event_behind_a_shorter_one)
{
    heard_monitor_c monitor;
    monitor.send("ACTION=change");
    monitor.send("A=1");
    EXPECT_THAT(monitor.texts(), testing::ElementsAre(heard("ACTION=change"), heard("A=1")));
}

TEST(usb_monitor, serves_an_event_once)
{
    heard_monitor_c monitor;
    monitor.send("ACTION=change");
    usleep(WATCH_US);
    EXPECT_THAT(monitor.texts(), testing::ElementsAre(heard("ACTION=change")));
}

TEST(usb_monitor, asks_for_a_small_buffer)
{
    heard_monitor_c monitor;
    monitor.send("ACTION=change");
    EXPECT_EQ(g_buffer_size, 1024);
}

} // namespace

extern "C" int socket(int domain, int type, int protocol) noexcept
{
    if (domain == AF_NETLINK && g_event_socket != NO_SOCKET) {
        return g_event_socket;
    }
    using socket_func = int (*)(int, int, int);
    static const socket_func next = reinterpret_cast<socket_func>(dlsym(RTLD_NEXT, "socket"));
    return next(domain, type, protocol);
}

extern "C" int setsockopt(int fd, int level, int name, const void *value_ptr, socklen_t size) noexcept
{
    if (level == SOL_SOCKET && name == SO_RCVBUF) {
        g_buffer_size = *static_cast<const int *>(value_ptr);
    }
    using set_func = int (*)(int, int, int, const void *, socklen_t);
    static const set_func next = reinterpret_cast<set_func>(dlsym(RTLD_NEXT, "setsockopt"));
    return next(fd, level, name, value_ptr, size);
}
