#include "pub/pty/pty.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <termios.h>
#include <unistd.h>

#include "pub/error.h"
#include "pub/pub-log.h"
#include "pub/util/util.h"

namespace {

constexpr uint32_t KERNEL_NAME_SIZE = 128;
constexpr mode_t LINK_MODE = 0660;
constexpr uid_t SYSTEM_USER = 1000;
constexpr gid_t RADIO_GROUP = 1001;

/* Whether something is there, be it a link that leads nowhere. */
bool is_present(const char *path)
{
    struct stat info = {};
    return lstat(path, &info) == 0;
}

const char *presence(const char *path)
{
    return is_present(path) ? "exists" : "not exists";
}

/* Closes the master; descriptor 0 is what a channel holds that was never opened. */
void close_master(pub_pty_st *pty_ptr)
{
    memset(pty_ptr->m_pts_name_a, 0, sizeof(pty_ptr->m_pts_name_a));
    if (pty_ptr->m_ptm_fd > 0) {
        close(pty_ptr->m_ptm_fd);
    }
    pty_ptr->m_ptm_fd = -1;
}

/* Asks the kernel for the slave's name and keeps what fits; false when there is none. */
bool read_pts_name(pub_pty_st *pty_ptr)
{
    char name_a[KERNEL_NAME_SIZE] = {};
    const int error_number = ptsname_r(pty_ptr->m_ptm_fd, name_a, sizeof(name_a));
    errno = error_number > 0 ? error_number : errno;
    PUB_LOG(g_pub_pty_log, "create_pts_mapping pts_name_ptr[%s]", error_number == 0 ? name_a : "(null)");
    if (error_number != 0) {
        return false;
    }
    const size_t limit = sizeof(pty_ptr->m_pts_name_a) - 1;
    const size_t length = strlen(name_a);
    if (length > limit) {
        PUB_LOG(g_pub_pty_log, "WARNING !");
        PUB_LOG(g_pub_pty_log, "[PTY]%d > %d", static_cast<int>(length), static_cast<int>(limit));
    }
    memset(pty_ptr->m_pts_name_a, 0, sizeof(pty_ptr->m_pts_name_a));
    memcpy(pty_ptr->m_pts_name_a, name_a, length < limit ? length : limit);
    PUB_LOG(g_pub_pty_log, "create_pts_mapping m_pts_name_a[%s] ret_val[%d]", pty_ptr->m_pts_name_a,
            PUB_ERR_NONE);
    return true;
}

/* Clears the mapping path of what an earlier run left there; symlink finds out when that was not possible. */
void remove_stale_mapping(const char *path)
{
    const int unlink_result = unlink(path);
    PUB_LOG(g_pub_pty_log, "create_pts_mapping unlink(%s) ret_val[%d]", path, unlink_result);
    if (unlink_result == 0) {
        PUB_LOG(g_pub_pty_log, "create_pts_mapping \"%s\" %s", path, presence(path));
    }
}

/* The calls of set_ptm_attr; returns the name of the one that failed, null when none did. */
const char *make_ptm_raw(int fd)
{
    termios attr = {};
    int status = tcgetattr(fd, &attr);
    PUB_LOG(g_pub_pty_log, "set_ptm_attr tcgetattr(%d) ret_val[%d]", fd, status);
    if (status != 0) {
        return "tcgetattr";
    }
    attr.c_iflag = 0;
    attr.c_oflag &= ~static_cast<tcflag_t>(OPOST | OLCUC | OCRNL | ONOCR | ONLRET);
    attr.c_lflag &= ~static_cast<tcflag_t>(ISIG | ICANON | ECHO | ECHOE);
    status = tcsetattr(fd, TCSANOW, &attr);
    PUB_LOG(g_pub_pty_log, "set_ptm_attr tcsetattr(%d) ret_val[%d]", fd, status);
    if (status != 0) {
        return "tcsetattr";
    }
    /* The kernel grants access to the slave by itself; the line stays for those who read the log by it. */
    PUB_LOG(g_pub_pty_log, "set_ptm_attr grantpt(%d) ret_val[%d]", fd, 0);
    status = unlockpt(fd);
    PUB_LOG(g_pub_pty_log, "set_ptm_attr unlockpt(%d) ret_val[%d]", fd, status);
    return status != 0 ? "unlockpt" : nullptr;
}

} // namespace

int pub_pty_open(pub_pty_st *pty_ptr)
{
    if (pty_ptr == nullptr) {
        return pub_log_error(g_pub_pty_log, PUB_ERR_PARAM);
    }
    PUB_LOG(g_pub_pty_log, "pub_pty_open m_ptm_fd[%d]", pty_ptr->m_ptm_fd);
    if (pty_ptr->m_ptm_fd > 0 && pub_pty_close(pty_ptr) != PUB_ERR_NONE) {
        close_master(pty_ptr); /* its link would not go, but the descriptor is about to be forgotten */
    }

    /* O_CLOEXEC: a program started meanwhile would keep the line up after the daemon has closed it. */
    pty_ptr->m_ptm_fd = open("/dev/ptmx", O_RDWR | O_NOCTTY | O_CLOEXEC);
    PUB_LOG(g_pub_pty_log, "pub_pty_open m_ptm_fd[%d]", pty_ptr->m_ptm_fd);
    if (pty_ptr->m_ptm_fd < 0) {
        pub_log_call_error(g_pub_pty_log, "open", PUB_ERR_SYS_CALL);
        pub_pty_close(pty_ptr);
        return PUB_ERR_FILE;
    }
    int status = create_pts_mapping(pty_ptr);
    if (status != PUB_ERR_NONE) {
        pub_pty_delete_mapping(pty_ptr);
        pub_pty_close(pty_ptr);
        return status;
    }
    status = set_ptm_attr(pty_ptr->m_ptm_fd);
    if (status == PUB_ERR_NONE && pty_ptr->m_is_nonblock != 0) {
        status = pub_util_set_fd_mode(pty_ptr->m_ptm_fd, pty_ptr->m_is_nonblock);
    }
    if (status != PUB_ERR_NONE) {
        pub_pty_close(pty_ptr);
        return status;
    }
    PUB_LOG(g_pub_pty_log, "pub_pty_open \"%s\" %s", pty_ptr->m_pts_mapping_name_a,
            presence(pty_ptr->m_pts_mapping_name_a));
    PUB_LOG(g_pub_pty_log, "pub_pty_open m_ptm_fd[%d]; m_pts_name_a[%s] m_pts_mapping_name_a[%s]",
            pty_ptr->m_ptm_fd, pty_ptr->m_pts_name_a, pty_ptr->m_pts_mapping_name_a);
    return PUB_ERR_NONE;
}

int pub_pty_close(pub_pty_st *pty_ptr)
{
    if (pty_ptr == nullptr || pty_ptr->m_ptm_fd < 0) {
        pub_log_bad_param(g_pub_pty_log, {pty_ptr == nullptr, pty_ptr != nullptr});
        return PUB_ERR_SYS_CALL;
    }
    const int status = pub_pty_delete_mapping(pty_ptr);
    PUB_LOG(g_pub_pty_log, "pub_pty_close pub_pty_delete_mapping ret_val[%d]", status);
    if (status == PUB_ERR_NONE) {
        close_master(pty_ptr);
    }
    return status;
}

int pub_pty_delete_mapping(pub_pty_st *pty_ptr)
{
    if (pty_ptr == nullptr) {
        return pub_log_fail(g_pub_pty_log, PUB_ERR_PARAM, "[PTY]%d", 1);
    }
    const char *mapping = pty_ptr->m_pts_mapping_name_a;
    if (!is_present(mapping)) {
        PUB_LOG(g_pub_pty_log, "WARNING !");
        PUB_LOG(g_pub_pty_log, "pub_pty_delete_mapping \"%s\" does not exist", mapping);
        return PUB_ERR_NONE;
    }
    const int unlink_result = unlink(mapping);
    PUB_LOG(g_pub_pty_log, "pub_pty_delete_mapping unlink(%s) ret_val[%d]", mapping, unlink_result);
    if (unlink_result != 0) {
        pub_log_call_error(g_pub_pty_log, "unlink", PUB_ERR_SYS_CALL);
        return PUB_ERR_FILE;
    }
    return PUB_ERR_NONE;
}

int create_pts_mapping(pub_pty_st *pty_ptr)
{
    const bool is_absent = pty_ptr == nullptr;
    const bool is_closed = !is_absent && pty_ptr->m_ptm_fd < 0;
    const bool is_unnamed = !is_absent && pty_ptr->m_pts_mapping_name_a[0] == '\0';
    if (is_absent || is_closed || is_unnamed) {
        return pub_log_fail(g_pub_pty_log, PUB_ERR_PARAM, "[PTY]%d, %d, %d", is_absent, is_closed,
                            is_unnamed);
    }
    if (!read_pts_name(pty_ptr)) {
        pub_log_call_error(g_pub_pty_log, "ptsname", PUB_ERR_SYS_CALL);
        return PUB_ERR_FILE;
    }

    const char *slave = pty_ptr->m_pts_name_a;
    const char *mapping = pty_ptr->m_pts_mapping_name_a;
    remove_stale_mapping(mapping);
    const int symlink_result = symlink(slave, mapping);
    PUB_LOG(g_pub_pty_log, "create_pts_mapping symlink(%s, %s) ret_val[%d]", slave, mapping, symlink_result);
    if (symlink_result != 0) {
        pub_log_call_error(g_pub_pty_log, "symlink", PUB_ERR_SYS_CALL);
        return pub_log_fail(g_pub_pty_log, PUB_ERR_FILE, "[PTY]map %s -> %s failed", mapping, slave);
    }

    /* Both calls follow the link: the app needs the rights on the slave itself. */
    const int chmod_result = chmod(mapping, LINK_MODE);
    PUB_LOG(g_pub_pty_log, "create_pts_mapping chmod(%s, %d) ret_val[%d]", mapping,
            static_cast<int>(LINK_MODE), chmod_result);
    if (chmod_result != 0) {
        pub_log_call_error(g_pub_pty_log, "chmod", PUB_ERR_SYS_CALL);
        return PUB_ERR_FILE;
    }
    /* Where the system allows no change of owner, the slave serves its owner all the same. */
    const int ignored = chown(mapping, SYSTEM_USER, RADIO_GROUP);
    static_cast<void>(ignored);
    PUB_LOG(g_pub_pty_log, "create_pts_mapping chown(%s, %d, %d) ret_val[%d]", mapping,
            static_cast<int>(SYSTEM_USER), static_cast<int>(RADIO_GROUP), chmod_result);
    PUB_LOG(g_pub_pty_log, "create_pts_mapping m_pts_mapping_name_a[%s] ret_val[%d]", mapping, PUB_ERR_NONE);
    return PUB_ERR_NONE;
}

int set_ptm_attr(int fd)
{
    PUB_LOG(g_pub_pty_log, "set_ptm_attr fd[%d]", fd);
    const char *failed_call = make_ptm_raw(fd);
    const int status = failed_call == nullptr ? PUB_ERR_NONE : PUB_ERR_FILE;
    if (failed_call != nullptr) {
        pub_log_call_error(g_pub_pty_log, failed_call, PUB_ERR_SYS_CALL);
    }
    PUB_LOG(g_pub_pty_log, "set_ptm_attr fd[%d] ret_val[%d]", fd, status);
    return status;
}
