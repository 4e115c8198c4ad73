#include "amt/amt-handle/reader/reader.h"

#include <linux/netlink.h>
#include <stdint.h>
#include <sys/socket.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-handle/reader/usb-event.h"
#include "amt/amt-log.h"
#include "pub/util/thread-end.h"

namespace {

constexpr int RECEIVE_BUFFER_SIZE = 1024;
constexpr uint32_t KERNEL_GROUP = 1;
constexpr int POLL_MS = 100;

/* Failures are not looked at: a monitor that hears nothing changes nothing. */
int open_event_socket()
{
    const int fd = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_KOBJECT_UEVENT);
    const int size = RECEIVE_BUFFER_SIZE;
    setsockopt(fd, SOL_SOCKET, SO_RCVBUF, &size, sizeof(size));
    sockaddr_nl address = {};
    address.nl_family = AF_NETLINK;
    address.nl_pid = static_cast<uint32_t>(getpid());
    address.nl_groups = KERNEL_GROUP;
    (void)bind(fd, reinterpret_cast<const sockaddr *>(&address), sizeof(address));
    return fd;
}

/* Whether an event has come in time. */
bool receive_event(int fd, amt_usb_event_st *event_ptr)
{
    const int ready = amt_wait_readable(fd, POLL_MS);
    if (ready < 0) {
        /* Without a socket there is nothing to wait on, but still somebody who may stop this thread. */
        pub_util_sleep_ms(POLL_MS);
    }
    if (ready <= 0) {
        return false;
    }
    const ssize_t length = recv(fd, event_ptr->m_text_a, AMT_USB_EVENT_SIZE, MSG_DONTWAIT);
    if (length <= 0) {
        return false;
    }
    event_ptr->m_length = static_cast<uint32_t>(length);
    event_ptr->m_text_a[length] = '\0';
    return true;
}

bool is_to_end()
{
    return g_usb_activate == 0 && g_handle_state.m_usb_state == amt_usb_en::DISCONNECTED;
}

} // namespace

void amt_handle_monitor_usb_loop()
{
    amt_usb_event_st event;
    const int fd = open_event_socket();
    do {
        if (receive_event(fd, &event)) {
            amt_usb_event_serve(event);
        }
    } while (!is_to_end());
    PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb disconnect event, will exit amt service");
    close(fd);
    amt_worker_leave(&g_handle_context.m_usb_monitor);
    amt_process_end();
}
