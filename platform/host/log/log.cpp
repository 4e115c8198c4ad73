#include "platform/include/android/log.h"

#include <atomic>
#include <errno.h>
#include <fcntl.h>
#include <pthread.h>
#include <stdarg.h>
#include <stdio.h>
#include <string.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include "platform/host/log/calendar.h"
#include "platform/host/stand-in/stand-in.h"

/*
 * One line a record: MM-DD HH:MM:SS.mmm PID TID D tag: text (time in UTC). It is made in one buffer on the
 * stack and leaves in one write, so records of several threads and processes never mix, and a record may be
 * written from a signal handler that interrupted another one.
 */

namespace {

/* The longest text the daemon makes (a 4 KiB receive area), even if each of its characters had to be escaped.
 */
constexpr uint32_t RECORD_SIZE = 10 * 1024;
constexpr int FD_UNKNOWN = -1;

std::atomic<int> g_log_fd{FD_UNKNOWN};

/* The ids are asked for once: a system call a record would cost as much as the rest of it. */
std::atomic<pid_t> g_pid{0};
thread_local volatile pid_t t_tid __attribute__((tls_model("initial-exec"))) = 0;

void forget_ids_in_child()
{
    g_pid.store(0, std::memory_order_relaxed);
    t_tid = 0;
}

__attribute__((constructor)) void watch_forks()
{
    pthread_atfork(nullptr, nullptr, forget_ids_in_child);
}

pid_t process_id()
{
    pid_t pid = g_pid.load(std::memory_order_relaxed);
    if (pid == 0) {
        pid = getpid();
        g_pid.store(pid, std::memory_order_relaxed);
    }
    return pid;
}

pid_t thread_id()
{
    if (t_tid == 0) {
        t_tid = gettid();
    }
    return t_tid;
}

int open_log()
{
    const char *path = stand_in_setting(STAND_IN_LOG);
    if (path == nullptr) {
        return STDERR_FILENO;
    }
    const int fd = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0666);
    if (fd < 0) {
        return STDERR_FILENO;
    }
    /* Never one of the three standard descriptors, also when the process was started without them. */
    if (fd > STDERR_FILENO) {
        return fd;
    }
    const int moved = fcntl(fd, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
    close(fd);
    return moved < 0 ? STDERR_FILENO : moved;
}

int log_fd()
{
    int fd = g_log_fd.load(std::memory_order_acquire);
    if (fd != FD_UNKNOWN) {
        return fd;
    }
    const int opened = open_log();
    if (g_log_fd.compare_exchange_strong(fd, opened, std::memory_order_acq_rel)) {
        return opened;
    }
    if (opened != STDERR_FILENO) {
        close(opened); /* another thread was first */
    }
    return fd;
}

char *put_number(char *to, uint32_t value, uint32_t width)
{
    char digit_a[10];
    uint32_t count = 0;
    do {
        digit_a[count++] = static_cast<char>('0' + value % 10);
        value /= 10;
    } while (value != 0 || count < width);
    while (count != 0) {
        *to++ = digit_a[--count];
    }
    return to;
}

char *put_time(char *to)
{
    struct timespec now;
    clock_gettime(CLOCK_REALTIME, &now);
    const uint32_t second_of_day = static_cast<uint32_t>(now.tv_sec % 86400);
    uint32_t month = 0;
    uint32_t day = 0;
    log_month_and_day(now.tv_sec / 86400, &month, &day);
    to = put_number(to, month, 2);
    *to++ = '-';
    to = put_number(to, day, 2);
    *to++ = ' ';
    to = put_number(to, second_of_day / 3600, 2);
    *to++ = ':';
    to = put_number(to, second_of_day / 60 % 60, 2);
    *to++ = ':';
    to = put_number(to, second_of_day % 60, 2);
    *to++ = '.';
    to = put_number(to, static_cast<uint32_t>(now.tv_nsec / 1000000), 3);
    *to++ = ' ';
    return to;
}

char priority_letter(int priority)
{
    static constexpr char letter_a[] = "??VDIWEFS";
    return priority >= 0 && priority <= ANDROID_LOG_SILENT ? letter_a[priority] : '?';
}

/* At most this much of a tag is shown. */
constexpr size_t TAG_SIZE = 64;

char *put_head(char *to, int priority, const char *tag)
{
    to = put_time(to);
    to = put_number(to, static_cast<uint32_t>(process_id()), 1);
    *to++ = ' ';
    to = put_number(to, static_cast<uint32_t>(thread_id()), 1);
    *to++ = ' ';
    *to++ = priority_letter(priority);
    *to++ = ' ';
    const char *shown = tag != nullptr ? tag : "(null)";
    const size_t tag_length = strnlen(shown, TAG_SIZE);
    memcpy(to, shown, tag_length);
    to += tag_length;
    *to++ = ':';
    *to++ = ' ';
    return to;
}

} // namespace

STAND_IN_INTERFACE int __android_log_print(int priority, const char *tag, const char *format, ...)
{
    const int saved_errno = errno;
    char record_a[RECORD_SIZE];
    char *text = put_head(record_a, priority, tag);
    const uint32_t head_length = static_cast<uint32_t>(text - record_a);
    const uint32_t room = RECORD_SIZE - head_length - 1; /* the line end's byte is kept */

    va_list args;
    va_start(args, format);
    errno = saved_errno; /* for %m */
    const int wanted = vsnprintf(text, room, format, args);
    va_end(args);
    uint32_t length = wanted < 0 ? 0 : static_cast<uint32_t>(wanted);
    length = head_length + stand_in_escape(text, length < room ? length : room - 1, room);
    record_a[length++] = '\n';

    /* Not write(2): a record is no place to end a thread at, and to be one costs a process of several threads. */
    const ssize_t written = syscall(SYS_write, log_fd(), record_a, static_cast<size_t>(length));
    errno = saved_errno;
    return static_cast<int>(written);
}
