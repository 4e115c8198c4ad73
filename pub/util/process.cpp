#include "pub/util/util.h"

#include <errno.h>
#include <sched.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "pub/error.h"
#include "pub/pub-log.h"

namespace {

constexpr uint32_t WORD_SIZE = 80;
constexpr uint32_t PROC_PATH_SIZE = 256;
constexpr uint32_t SHELL_COMMAND_SIZE = 60;
constexpr int PRIORITY_BELOW_MAXIMUM = 4;
constexpr char CHECK_RUN[] = "pub_util_get_pid_and_check_run";

bool is_empty(const char *text)
{
    return text != nullptr && *text == '\0';
}

bool is_blank(int character)
{
    return character == ' ' || (character >= '\t' && character <= '\r');
}

/* Opens a file for reading; a failure is logged in the name of func. */
FILE *open_file(const char *path, const char *func, int line)
{
    FILE *file = fopen(path, "re");
    if (file == nullptr) {
        pub_log_error(g_pub_util_log, PUB_ERR_FILE, func, line);
        PUB_LOG(g_pub_util_log, "Open file \"%s\" fail: %d - %s", path, errno, strerror(errno));
    }
    return file;
}

/*
 * Reads the first word of a command line, whose arguments are separated by zero bytes; what exceeds the
 * buffer is left unread. Returns 1, or EOF with buf untouched, as fscanf would.
 */
int scan_word(FILE *file, char *buf, uint32_t capacity)
{
    int character = getc(file);
    while (is_blank(character)) {
        character = getc(file);
    }
    if (character == EOF) {
        return EOF;
    }
    uint32_t used = 0;
    while (used < capacity - 1 && character != EOF && character != '\0' && !is_blank(character)) {
        buf[used++] = static_cast<char>(character);
        character = getc(file);
    }
    buf[used] = '\0';
    return 1;
}

/* The process id that the file holds, 0 when there is none to be had. */
long read_pid_file(const char *pid_file)
{
    FILE *file = open_file(pid_file, CHECK_RUN, __LINE__);
    if (file == nullptr) {
        return 0;
    }
    long pid = 0;
    errno = 0; /* text that is no number sets none */
    const int scanned = fscanf(file, "%18ld", &pid);
    if (scanned != 1) {
        pub_log_error(g_pub_util_log, PUB_ERR_FILE, CHECK_RUN);
        PUB_LOG(g_pub_util_log, "fscanf() return: %d; %d - %s", scanned, errno, strerror(errno));
        pid = 0;
    } else {
        PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run pid[%d]", static_cast<int>(pid));
    }
    fclose(file);
    return pid;
}

/* Whether the process lives and its command line's first word contains name. */
bool is_program(long pid, const char *name)
{
    char buf_a[WORD_SIZE];
    snprintf(buf_a, sizeof(buf_a), "/proc/%ld/cmdline", pid);
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run fopen buf_a[%s]", buf_a);
    FILE *file = open_file(buf_a, CHECK_RUN, __LINE__);
    if (file == nullptr) {
        return false;
    }
    const int scanned = scan_word(file, buf_a, sizeof(buf_a));
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run fscanf buf_a[%s] ret_val[%d]", buf_a, scanned);
    fclose(file);
    return scanned == 1 && strstr(buf_a, name) != nullptr;
}

} // namespace

int pub_util_get_pid_and_check_run(const char *pid_file, const char *name, int32_t *is_run_ptr,
                                   int32_t *pid_ptr)
{
    pub_log_entry(g_pub_util_log);
    if (pid_file == nullptr || is_empty(pid_file) || name == nullptr || is_empty(name) ||
        is_run_ptr == nullptr || pid_ptr == nullptr)
    {
        pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
        pub_log_flags(g_pub_util_log, {pid_file == nullptr, is_empty(pid_file), name == nullptr,
                                       is_empty(name), is_run_ptr == nullptr, pid_ptr == nullptr});
        return PUB_ERR_PARAM;
    }
    PUB_LOG(g_pub_util_log, "pub_util_get_pid_and_check_run pid_file_ptr[%s] name_ptr[%s]", pid_file, name);
    *is_run_ptr = 0;
    *pid_ptr = 0;
    const long pid = read_pid_file(pid_file);
    if (pid != 0 && is_program(pid, name)) {
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
        pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
        pub_log_flags(g_pub_util_log, {true});
        return PUB_ERR_PARAM;
    }
    const int pid = static_cast<int>(getpid());
    char command_a[SHELL_COMMAND_SIZE];
    snprintf(command_a, sizeof(command_a), "echo %d > /tmp/%s.pid", pid, name);
    /* A process without a pid file serves all the same. */
    const int ignored = system(command_a); // NOLINT(cert-env33-c,concurrency-mt-unsafe)
    static_cast<void>(ignored);
    PUB_LOG(g_pub_util_log, "PID of %s: %d", name, pid);
    return PUB_ERR_NONE;
}

int pub_util_get_cmd_line(int32_t pid, char *buf, uint32_t capacity)
{
    pub_log_entry(g_pub_util_log);
    if (buf == nullptr || capacity == 0) {
        pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
        pub_log_flags(g_pub_util_log, {buf == nullptr, capacity == 0});
        return PUB_ERR_PARAM;
    }
    memset(buf, 0, capacity);
    char path_a[PROC_PATH_SIZE];
    snprintf(path_a, sizeof(path_a), "/proc/%ld/cmdline", static_cast<long>(pid));
    FILE *file = open_file(path_a, __func__, __LINE__);
    if (file == nullptr) {
        return PUB_ERR_FILE;
    }
    errno = 0; /* an empty command line sets none */
    const int scanned = scan_word(file, buf, capacity);
    if (scanned != 1) {
        pub_log_sys_call(g_pub_util_log, "fscanf");
        pub_log_error(g_pub_util_log, PUB_ERR_SYS_CALL);
    }
    fclose(file);
    return scanned == 1 ? PUB_ERR_NONE : PUB_ERR_FILE;
}

int pub_util_get_process_path(char *buf, uint32_t capacity)
{
    pub_log_entry(g_pub_util_log);
    if (buf == nullptr || capacity == 0) {
        pub_log_error(g_pub_util_log, PUB_ERR_PARAM);
        pub_log_flags(g_pub_util_log, {buf == nullptr, capacity == 0});
        return PUB_ERR_PARAM;
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
        pub_log_sys_call(g_pub_util_log, "sched_get_priority_max");
        pub_log_error(g_pub_util_log, PUB_ERR_SYS_CALL);
        return PUB_ERR_SYS_CALL;
    }
    sched_param param = {};
    param.sched_priority = maximum - PRIORITY_BELOW_MAXIMUM;
    if (sched_setscheduler(getpid(), SCHED_FIFO, &param) < 0) {
        pub_log_sys_call(g_pub_util_log, "sched_setscheduler");
        pub_log_error(g_pub_util_log, PUB_ERR_SYS_CALL);
        return PUB_ERR_SYS_CALL;
    }
    return PUB_ERR_NONE;
}
