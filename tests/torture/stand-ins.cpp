#include "tests/torture/stand-ins.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdio_ext.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/reboot.h>
#include <sys/select.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/wait.h>
#include <termios.h>
#include <time.h>
#include <unistd.h>
#include <zlib.h>

#include "tests/torture/failure.h"

/* Each function that can fail, in the order of their numbers. */
#define FUNCTIONS(ROW)                                                                                       \
    ROW(open)                                                                                                \
    ROW(read)                                                                                                \
    ROW(write)                                                                                               \
    ROW(poll)                                                                                                \
    ROW(ppoll)                                                                                               \
    ROW(select)                                                                                              \
    ROW(ioctl)                                                                                               \
    ROW(fcntl)                                                                                               \
    ROW(fopen)                                                                                               \
    ROW(getc)                                                                                                \
    ROW(fputs)                                                                                               \
    ROW(fprintf)                                                                                             \
    ROW(fflush)                                                                                              \
    ROW(fclose)                                                                                              \
    ROW(tcgetattr)                                                                                           \
    ROW(tcsetattr)                                                                                           \
    ROW(stat)                                                                                                \
    ROW(lstat)                                                                                               \
    ROW(statfs64)                                                                                            \
    ROW(access)                                                                                              \
    ROW(mkdir)                                                                                               \
    ROW(symlink)                                                                                             \
    ROW(unlink)                                                                                              \
    ROW(chmod)                                                                                               \
    ROW(fchmod)                                                                                              \
    ROW(chown)                                                                                               \
    ROW(ptsname_r)                                                                                           \
    ROW(unlockpt)                                                                                            \
    ROW(fork)                                                                                                \
    ROW(waitpid)                                                                                             \
    ROW(system)                                                                                              \
    ROW(sched_setscheduler)                                                                                  \
    ROW(pthread_create)                                                                                      \
    ROW(timer_create)                                                                                        \
    ROW(timer_settime)                                                                                       \
    ROW(sigtimedwait)                                                                                        \
    ROW(malloc)                                                                                              \
    ROW(mmap)                                                                                                \
    ROW(socket)                                                                                              \
    ROW(setsockopt)                                                                                          \
    ROW(bind)                                                                                                \
    ROW(recv)                                                                                                \
    ROW(dlopen)                                                                                              \
    ROW(dlsym)                                                                                               \
    ROW(inflateInit2_)                                                                                       \
    ROW(inflate)                                                                                             \
    ROW(reboot)

namespace {

#define NUMBER_OF(name) NUMBER_##name,
enum : uint32_t
{
    FUNCTIONS(NUMBER_OF)
};

#define IS_STRUCK(name) torture_is_struck(NUMBER_##name, __builtin_return_address(0))

/* The flags of a C library's stream, which a failing function sets. */
constexpr int STREAM_AT_END = 0x10;
constexpr int STREAM_FAILED = 0x20;

constexpr size_t SHORT_READ = 5;

bool is_short()
{
    return g_torture_page_ptr->m_mode == torture_mode_en::SHORT;
}

/* The type of a function without its promise to throw nothing. */
template <typename R, typename... A> auto get_type(R (*function)(A...)) -> R (*)(A...);

/* What most functions need: the failure, or the function itself. */
template <uint32_t NUMBER, auto FUNCTION, typename TYPE = decltype(get_type(FUNCTION))> struct plain_st;

template <uint32_t NUMBER, auto FUNCTION, typename R, typename... A>
struct plain_st<NUMBER, FUNCTION, R (*)(A...)>
{
    static R call(A... arguments)
    {
        return torture_is_struck(NUMBER, __builtin_return_address(0)) ? torture_give<R>()
                                                                      : FUNCTION(arguments...);
    }
};

/* descriptors */

int stand_in_open(const char *path, int flags, mode_t mode)
{
    return IS_STRUCK(open) ? torture_give<int>() : open(path, flags, mode);
}

int stand_in_ioctl(int fd, unsigned long request, void *argument)
{
    return IS_STRUCK(ioctl) ? torture_give<int>() : ioctl(fd, request, argument);
}

int stand_in_fcntl(int fd, int command, void *argument)
{
    return IS_STRUCK(fcntl) ? torture_give<int>() : fcntl(fd, command, argument);
}

void count_waiting(int fd, int change)
{
    if (fd >= 0 && fd < static_cast<int>(TORTURE_FD_COUNT) && torture_is_counted()) {
        g_torture_page_ptr->m_waiting_a[fd] += static_cast<uint32_t>(change);
    }
}

/*
 * A read fails when there is something to read, not when it begins to wait for it. Whether the line has gone while it
 * waited: a read that waits gets EIO then, one that comes later the end of the data.
 */
bool is_lost_in_wait(int fd)
{
    pollfd poll_fd = {fd, POLLIN, 0};
    if (poll(&poll_fd, 1, 0) != 0) {
        return false;
    }
    count_waiting(fd, 1);
    while (poll(&poll_fd, 1, -1) < 0 && errno == EINTR) {
    }
    count_waiting(fd, -1);
    int count = 0;
    return (poll_fd.revents & POLLHUP) != 0 && (ioctl(fd, FIONREAD, &count) != 0 || count == 0);
}

ssize_t stand_in_read(int fd, void *buf, size_t size)
{
    const bool is_lost = is_lost_in_wait(fd);
    if (IS_STRUCK(read)) {
        if (!is_short()) {
            return torture_give<ssize_t>();
        }
        size = size < SHORT_READ ? size : SHORT_READ;
    }
    if (is_lost) {
        errno = EIO;
        return -1;
    }
    const ssize_t count = read(fd, buf, size);
    if (count > 0 && torture_is_counted()) {
        g_torture_page_ptr->m_consumed += static_cast<uint32_t>(count);
    }
    return count;
}

ssize_t stand_in_write(int fd, const void *buf, size_t size)
{
    if (IS_STRUCK(write)) {
        if (!is_short()) {
            return torture_give<ssize_t>();
        }
        size /= 2;
    }
    return write(fd, buf, size);
}

ssize_t stand_in_recv(int fd, void *buf, size_t size, int flags)
{
    if (IS_STRUCK(recv)) {
        if (!is_short()) {
            return torture_give<ssize_t>();
        }
        size /= 2;
    }
    return recv(fd, buf, size, flags);
}

int stand_in_poll(pollfd *fds_ptr, nfds_t count, int timeout)
{
    return IS_STRUCK(poll) ? torture_give<int>() : poll(fds_ptr, count, timeout);
}

int stand_in_ppoll(pollfd *fds_ptr, nfds_t count, const timespec *timeout_ptr, const sigset_t *mask_ptr)
{
    if (IS_STRUCK(ppoll)) {
        return torture_give<int>();
    }
    const int fd = count > 0 ? fds_ptr->fd : -1;
    count_waiting(fd, 1);
    const int ready = ppoll(fds_ptr, count, timeout_ptr, mask_ptr);
    count_waiting(fd, -1);
    return ready;
}

/* streams */

int fail_stream(FILE *stream)
{
    stream->_flags |= g_torture_page_ptr->m_errno != 0 ? STREAM_FAILED : STREAM_AT_END;
    return torture_give<int>();
}

/* Only a call that asks the kernel for more can fail. */
int stand_in_getc(FILE *stream)
{
    const bool asks = stream->_IO_read_ptr >= stream->_IO_read_end;
    return asks && IS_STRUCK(getc) ? fail_stream(stream) : getc(stream);
}

int stand_in_fputs(const char *text, FILE *stream)
{
    return IS_STRUCK(fputs) ? fail_stream(stream) : fputs(text, stream);
}

__attribute__((format(printf, 2, 3))) int stand_in_fprintf(FILE *stream, const char *format, ...)
{
    if (IS_STRUCK(fprintf)) {
        return fail_stream(stream);
    }
    va_list arguments;
    va_start(arguments, format);
    const int count = vfprintf(stream, format, arguments);
    va_end(arguments);
    return count;
}

/* What was not written is lost; of a short one a half has been. */
void lose_buffered(FILE *stream)
{
    if (__fwriting(stream) == 0) {
        return;
    }
    if (is_short()) {
        const size_t size = __fpending(stream) / 2;
        (void)!write(fileno(stream), stream->_IO_write_base, size);
    }
    __fpurge(stream);
}

int stand_in_fflush(FILE *stream)
{
    if (!IS_STRUCK(fflush)) {
        return fflush(stream);
    }
    lose_buffered(stream);
    return fail_stream(stream);
}

int stand_in_fclose(FILE *stream)
{
    if (!IS_STRUCK(fclose)) {
        return fclose(stream);
    }
    lose_buffered(stream);
    fclose(stream);
    return torture_give<int>();
}

/* the loader, which tells what has failed in a text of its own */

void *stand_in_dlopen(const char *path, int mode)
{
    return IS_STRUCK(dlopen) ? dlopen("/nowhere/there-is-no-such-library.so", mode) : dlopen(path, mode);
}

void *stand_in_dlsym(void *library, const char *name)
{
    return dlsym(library, IS_STRUCK(dlsym) ? "there_is_no_such_entry" : name);
}

/* threads */

struct thread_st
{
    void *(*m_routine)(void *);
    void *m_argument;
};

void *run_thread(void *argument)
{
    const thread_st thread = *static_cast<thread_st *>(argument);
    free(argument);
    /* A routine that several threads run has an argument that tells them apart. */
    const uint32_t offset = torture_get_offset(thread.m_argument);
    torture_name_thread(offset != 0 ? offset
                                    : torture_get_offset(reinterpret_cast<void *>(thread.m_routine)));
    return thread.m_routine(thread.m_argument);
}

int stand_in_pthread_create(pthread_t *id_ptr, const pthread_attr_t *attr_ptr, void *(*routine)(void *),
                            void *argument)
{
    if (IS_STRUCK(pthread_create)) {
        return torture_give<int>();
    }
    auto *const thread_ptr = static_cast<thread_st *>(malloc(sizeof(thread_st)));
    *thread_ptr = {routine, argument};
    return pthread_create(id_ptr, attr_ptr, run_thread, thread_ptr);
}

} // namespace

#define PLAIN(name)                                                                                          \
    {                                                                                                        \
#name, reinterpret_cast < void *>(plain_st <NUMBER_##name, name>::call)                              \
    }
#define SPECIAL(name)                                                                                        \
    {                                                                                                        \
#name, reinterpret_cast < void *>(stand_in_##name)                                                   \
    }

const torture_stand_in_st g_torture_stand_in_a[] = {
    SPECIAL(open),
    SPECIAL(read),
    SPECIAL(write),
    SPECIAL(poll),
    SPECIAL(ppoll),
    PLAIN(select),
    SPECIAL(ioctl),
    SPECIAL(fcntl),
    PLAIN(fopen),
    SPECIAL(getc),
    SPECIAL(fputs),
    SPECIAL(fprintf),
    SPECIAL(fflush),
    SPECIAL(fclose),
    PLAIN(tcgetattr),
    PLAIN(tcsetattr),
    PLAIN(stat),
    PLAIN(lstat),
    PLAIN(statfs64),
    PLAIN(access),
    PLAIN(mkdir),
    PLAIN(symlink),
    PLAIN(unlink),
    PLAIN(chmod),
    PLAIN(fchmod),
    PLAIN(chown),
    PLAIN(ptsname_r),
    PLAIN(unlockpt),
    PLAIN(fork),
    PLAIN(waitpid),
    PLAIN(system),
    PLAIN(sched_setscheduler),
    SPECIAL(pthread_create),
    PLAIN(timer_create),
    PLAIN(timer_settime),
    PLAIN(sigtimedwait),
    PLAIN(malloc),
    PLAIN(mmap),
    PLAIN(socket),
    PLAIN(setsockopt),
    PLAIN(bind),
    SPECIAL(recv),
    SPECIAL(dlopen),
    SPECIAL(dlsym),
    PLAIN(inflateInit2_),
    PLAIN(inflate),
    PLAIN(reboot),
};
const uint32_t g_torture_stand_in_count = sizeof(g_torture_stand_in_a) / sizeof(g_torture_stand_in_a[0]);
