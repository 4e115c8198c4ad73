#include "amt/amt-handle/reader/reader.h"

#include <linux/netlink.h>
#include <stdint.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-handle/handshake.h"
#include "amt/amt-log.h"
#include "pub/util/thread-end.h"

namespace {

constexpr int RECEIVE_BUFFER_SIZE = 1024;
constexpr uint32_t KERNEL_GROUP = 1;
constexpr int POLL_MS = 100;
constexpr uint32_t EVENT_SIZE = 2048;

/* What the kernel sends: strings one after the other, each terminated. */
struct event_st
{
    uint32_t m_length;
    char m_text_a[EVENT_SIZE + 1]; /* the last string is terminated even when the kernel's is not */
};

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
bool receive_event(int fd, event_st *event_ptr)
{
    const int ready = amt_wait_readable(fd, POLL_MS);
    if (ready < 0) {
        /* Without a socket there is nothing to wait on, but still somebody who may stop this thread. */
        pub_util_sleep_ms(POLL_MS);
    }
    if (ready <= 0) {
        return false;
    }
    const ssize_t length = recv(fd, event_ptr->m_text_a, EVENT_SIZE, MSG_DONTWAIT);
    if (length <= 0) {
        return false;
    }
    event_ptr->m_length = static_cast<uint32_t>(length);
    event_ptr->m_text_a[length] = '\0';
    return true;
}

/* The first string that tells the USB state, or null. */
const char *find_usb_state(const event_st &event)
{
    const char *const end = event.m_text_a + event.m_length;
    for (const char *text = event.m_text_a; text < end; text += strlen(text) + 1) {
        PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop uevent:[%s] nLen:%u", text, event.m_length);
        if (strstr(text, "USB_STATE") != nullptr) {
            return text;
        }
    }
    return nullptr;
}

void note_usb_state(const char *status)
{
    PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop usb_status:[%s]", status);
    if (strstr(status, "DISCONNECTED") != nullptr) {
        g_handle_state.m_usb_state = amt_usb_en::DISCONNECTED;
        PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb disconnect event");
        amt_handshake_link_down();
        return;
    }
    if (strstr(status, "CONFIGURED") != nullptr) {
        g_handle_state.m_usb_state = amt_usb_en::CONFIGURED;
        PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb CONFIGURED event");
        amt_handshake_link_up();
        return;
    }
    g_handle_state.m_usb_state = amt_usb_en::OTHER;
    PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb other status event");
}

bool is_to_end()
{
    return g_usb_activate == 0 && g_handle_state.m_usb_state == amt_usb_en::DISCONNECTED;
}

} // namespace

void amt_handle_monitor_usb_loop()
{
    event_st event;
    const int fd = open_event_socket();
    do {
        const char *const status = receive_event(fd, &event) ? find_usb_state(event) : nullptr;
        if (status != nullptr) {
            note_usb_state(status);
        }
    } while (!is_to_end());
    PUB_LOG(g_amt_handle_log, "amt_handle_monitor_usb_loop get usb disconnect event, will exit amt service");
    close(fd);
    amt_worker_leave(&g_handle_context.m_usb_monitor);
    amt_process_end();
}
