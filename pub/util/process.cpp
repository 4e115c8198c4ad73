#include "pub/util/process.h"

#include <errno.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "pub/error.h"
#include "pub/file/scan.h"
#include "pub/pub-log.h"
#include "pub/util/signal-table.h"

namespace {

constexpr uint32_t WORD_SIZE = 80;
constexpr uint32_t PROC_PATH_SIZE = 256;
constexpr uint32_t SHELL_COMMAND_SIZE = 60;
constexpr int PRIORITY_BELOW_MAXIMUM = 4;
constexpr uint32_t INTERRUPT_PATIENCE_MS = 200;
constexpr char CHECK_RUN[] = "pub_util_get_pid_and_check_run";

bool is_empty(const char *text)
{
    return text != nullptr && *text == '\0';
}

/* What a file that cannot be opened leaves in the log. */
int fail_open(const char *path, const pub_log_place_st &place = g_pub_util_log)
{
    return pub_log_fail(place, PUB_ERR_FILE, "Open file \"%s\" fail: %d - %s", path, errno, strerror(errno));
}

/* Whether the file holds a number, which goes to *pid_ptr. */
bool read_pid_file(const char *path, long *pid_ptr)
{
    const pub_file_st file(path, pub_file_mode_en::READ);
    if (!file.is_open()) {
        fail_open(path, {g_pub_util_log, CHECK_RUN});
        return false;
    }
    const int scanned = pub_file_scan_long(file, pid_ptr);
    if (scanned != 1) {
        pub_log_fail({g_pub_util_log, CHECK_RUN}, PUB_ERR_FILE, "fscanf() return: %d; %d - %s", scanned,
                     errno, strerror(errno));
        return false;
    }
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run pid[%d]", static_cast<int>(*pid_ptr));
    return true;
}

/* Whether the process lives and its command line's first word contains name. */
bool is_program(long pid, const char *name)
{
    char buf_a[WORD_SIZE];
    snprintf(buf_a, sizeof(buf_a), "/proc/%ld/cmdline", pid);
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run fopen buf_a[%s]", buf_a);
    const pub_file_st file(buf_a, pub_file_mode_en::READ);
    if (!file.is_open()) {
        fail_open(buf_a, {g_pub_util_log, CHECK_RUN});
        return false;
    }
    const int scanned = pub_file_scan_word(file, buf_a, sizeof(buf_a));
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run fscanf buf_a[%s] ret_val[%d]", buf_a, scanned);
    return scanned == 1 && strstr(buf_a, name) != nullptr;
}

/*
 * Waits, a bounded time, until a SIGINT that is on its way to another thread has got there: the next shell
 * command begins by throwing it away.
 */
void let_interrupt_pass()
{
    const int saved_errno = errno;
    const sigset_t interrupt = pub_util_get_signal_set({SIGINT});
    sigset_t own_mask;
    sigset_t pending;
    pthread_sigmask(SIG_BLOCK, &interrupt, &own_mask); /* only what is blocked is shown as pending */
    for (uint32_t i = 0; i < INTERRUPT_PATIENCE_MS; i++) {
        if (sigpending(&pending) != 0 || sigismember(&pending, SIGINT) != 1) {
            break;
        }
        poll(nullptr, 0, 1);
    }
    pthread_sigmask(SIG_SETMASK, &own_mask, nullptr);
    errno = saved_errno;
}

} // namespace

int pub_util_get_pid_and_check_run(const char *pid_file, const char *name, int32_t *is_run_ptr,
                                   int32_t *pid_ptr)
{
    pub_log_entry(g_pub_util_log);
    if (pid_file == nullptr || is_empty(pid_file) || name == nullptr || is_empty(name) ||
        is_run_ptr == nullptr || pid_ptr == nullptr)
    {
        return pub_log_bad_param(g_pub_util_log, {pid_file == nullptr, is_empty(pid_file), name == nullptr,
                                                  is_empty(name), is_run_ptr == nullptr, pid_ptr == nullptr});
    }
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run pid_file_ptr[%s] name_ptr[%s]", pid_file, name);
    *is_run_ptr = 0;
    *pid_ptr = 0;
    long pid = 0;
    if (read_pid_file(pid_file, &pid) && is_program(pid, name)) {
        *is_run_ptr = 1;
        *pid_ptr = static_cast<int32_t>(pid);
    }
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run return is_run_ptr[%d] pid_ptr[%d]", *is_run_ptr,
            *pid_ptr);
    return PUB_ERR_NONE;
}

int pub_util_create_pid_file(const char *name)
{
    pub_log_entry(g_pub_util_log);
    if (name == nullptr) {
        return pub_log_bad_param(g_pub_util_log, {true});
    }
    const int pid = static_cast<int>(getpid());
    char command_a[SHELL_COMMAND_SIZE];
    snprintf(command_a, sizeof(command_a), "echo %d > /tmp/%s.pid", pid, name);
    /* A process without a pid file serves all the same. */
    pub_util_run_shell(command_a);
    PUB_LOG(g_pub_util_log, "PID of %s: %d", name, pid);
    return PUB_ERR_NONE;
}

int pub_util_get_cmd_line(int32_t pid, char *buf, uint32_t capacity)
{
    pub_log_entry(g_pub_util_log);
    if (buf == nullptr || capacity == 0) {
        return pub_log_bad_param(g_pub_util_log, {buf == nullptr, capacity == 0});
    }
    memset(buf, 0, capacity);
    char path_a[PROC_PATH_SIZE];
    snprintf(path_a, sizeof(path_a), "/proc/%ld/cmdline", static_cast<long>(pid));
    const pub_file_st file(path_a, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return fail_open(path_a);
    }
    if (pub_file_scan_word(file, buf, capacity) != 1) {
        pub_log_call_error(g_pub_util_log, "fscanf", PUB_ERR_SYS_CALL);
        return PUB_ERR_FILE;
    }
    return PUB_ERR_NONE;
}

int pub_util_get_process_path(char *buf, uint32_t capacity)
{
    pub_log_entry(g_pub_util_log);
    if (buf == nullptr || capacity == 0) {
        return pub_log_bad_param(g_pub_util_log, {buf == nullptr, capacity == 0});
    }
    const int ret_val = pub_util_get_cmd_line(static_cast<int32_t>(getpid()), buf, capacity);
    if (ret_val != PUB_ERR_NONE) {
        return ret_val;
    }
    char *slash = strrchr(buf, '/');
    if (slash != nullptr) {
        *slash = '\0';
    }
    return PUB_ERR_NONE;
}

int pub_util_raise_process_priority()
{
    pub_log_entry(g_pub_util_log);
    const int maximum = sched_get_priority_max(SCHED_FIFO);
    if (maximum < 0) {
        return pub_log_call_error(g_pub_util_log, "sched_get_priority_max", PUB_ERR_SYS_CALL);
    }
    sched_param param = {};
    param.sched_priority = maximum - PRIORITY_BELOW_MAXIMUM;
    /* The kernel takes a process for its first thread; threads inherit from the one that creates them. */
    if (sched_setscheduler(getpid(), SCHED_FIFO, &param) < 0 || sched_setscheduler(0, SCHED_FIFO, &param) < 0)
    {
        return pub_log_call_error(g_pub_util_log, "sched_setscheduler", PUB_ERR_SYS_CALL);
    }
    return PUB_ERR_NONE;
}

int pub_util_run_shell(const char *command)
{
    let_interrupt_pass();
    return system(command); // NOLINT(cert-env33-c,concurrency-mt-unsafe)
}
