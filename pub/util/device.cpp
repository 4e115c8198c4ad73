#include "pub/util/device.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <termios.h>

#include "pub/error.h"
#include "pub/pub-log.h"
#include "pub/util/thread-end.h"

namespace {

struct serial_speed_st
{
    int32_t m_limit; /* the highest request this speed serves */
    speed_t m_speed;
    const char *m_name_ptr;
};

/* There is no speed below the first: a modem line never runs slower. */
constexpr serial_speed_st serial_speed_a[] = {
    {115200, B115200, "B115200"},
    {230400, B230400, "B230400"},
    {460800, B460800, "B460800"},
    {INT32_MAX, B921600, "B921600"},
};

const serial_speed_st *find_speed(int32_t speed)
{
    const serial_speed_st *row = serial_speed_a;
    while (speed > row->m_limit) {
        row++;
    }
    return row;
}

} // namespace

int pub_util_try_to_open_device(int *fd_ptr, const char *path, int flags, int32_t attempts, int32_t pause_ms)
{
    pub_log_entry(g_pub_util_log);
    if (fd_ptr == nullptr || path == nullptr || *path == '\0') {
        return pub_log_bad_param(g_pub_util_log,
                                 {fd_ptr == nullptr, path == nullptr, path != nullptr && *path == '\0'});
    }
    /*
     * O_CLOEXEC: shell commands, and players they leave behind, must not keep a port open that the daemon has
     * closed. O_NOCTTY: started by init the daemon leads a session without a terminal; a port that became its
     * terminal would kill it with a hangup signal when the cable is drawn.
     */
    const int open_flags = flags | O_CLOEXEC | O_NOCTTY;
    const uint32_t pause = pause_ms > 0 ? static_cast<uint32_t>(pause_ms) : 0;

    PUB_LOG(g_pub_util_log, "begin to check if can open device \"%s\"", path);
    PUB_LOG(g_pub_util_log, "(%ld/%ld)try to open device \"%s\"", 0L, static_cast<long>(attempts), path);
    for (int32_t attempt = 1;; attempt++) {
        /*
         * 0 counts as a failure, for closing the channels spares descriptor 0. It stays open: so the number
         * is taken, and the next attempt gets a usable one.
         */
        const int fd = open(path, open_flags);
        if (fd > 0) {
            *fd_ptr = fd;
            PUB_LOG(g_pub_util_log, "open device \"%s\" successfully", path);
            return PUB_ERR_NONE;
        }
        const int open_errno = errno;
        pub_log_error(g_pub_util_log, PUB_ERR_FILE);
        PUB_LOG(g_pub_util_log, "open device \"%s\" fail: %d - %s", path, errno, strerror(errno));
        pub_util_sleep_ms(pause);
        if (attempt >= attempts) {
            errno = open_errno;
            break;
        }
        PUB_LOG(g_pub_util_log, "(%ld/%ld)try to open device \"%s\"", static_cast<long>(attempt),
                static_cast<long>(attempts), path);
    }
    return pub_log_fail(g_pub_util_log, PUB_ERR_FILE, "open device \"%s\" fail: %d - %s", path, errno,
                        strerror(errno));
}

int pub_util_set_serial_dev_attr(int fd, int32_t speed)
{
    pub_log_entry(g_pub_util_log);
    if (fd < 0) {
        return pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
    }
    termios attr = {};
    const int get_result = tcgetattr(fd, &attr);
    if (get_result != 0) {
        pub_log_call_error(g_pub_util_log, "tcgetattr", PUB_ERR_SYS_CALL);
    }
    const serial_speed_st *row = find_speed(speed);
    PUB_LOG(g_pub_util_log, "convert speed %ld -> %s", static_cast<long>(speed), row->m_name_ptr);
    if (get_result != 0) {
        return PUB_ERR_SYS_CALL;
    }

    cfsetispeed(&attr, row->m_speed);
    cfsetospeed(&attr, row->m_speed);
    attr.c_iflag &= ~static_cast<tcflag_t>(IXON | ICRNL | INLCR);
    attr.c_oflag &= ~static_cast<tcflag_t>(ONLCR | OCRNL);
    attr.c_lflag = 0;
    attr.c_cflag |= CRTSCTS;
    if (tcsetattr(fd, TCSANOW, &attr) != 0) {
        return pub_log_call_error(g_pub_util_log, "tcsetattr", PUB_ERR_SYS_CALL);
    }
    return PUB_ERR_NONE;
}

int pub_util_set_fd_mode(int fd, int is_nonblock)
{
    pub_log_entry(g_pub_util_log);
    if (fd < 0) {
        return pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
    }
    PUB_LOG(g_pub_util_log, "pub_util_set_fd_mode fd[%d] is_nonblock_mode[%d]", fd, is_nonblock);
    const int old_flags = fcntl(fd, F_GETFL);
    const int new_flags = is_nonblock != 0 ? old_flags | O_NONBLOCK : old_flags & ~O_NONBLOCK;
    if (old_flags < 0 || fcntl(fd, F_SETFL, new_flags) < 0) {
        return pub_log_call_error(g_pub_util_log, "fcntl", PUB_ERR_FILE);
    }
    PUB_LOG(g_pub_util_log, "pub_util_set_fd_mode return ERR_NONE");
    return PUB_ERR_NONE;
}
