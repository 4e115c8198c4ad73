/*
 * The library of properties in a system in which single calls fail, each while its file in /handset/fail is there.
 * With an errno where the call has one:
 *
 *   app-read      what a pseudo-terminal's master has is lost          app-empty   it has nothing, at once
 *   camera        its descriptor is 0, as where nobody has one
 *   fopen         of the file whose path the file holds                ptmx        no pseudo-terminal can be opened
 *   pts-name      it is what the file holds
 *   event         of the kernel's is lost
 *   station       a text whose first line is REFUSED cannot be written
 *   tcgetattr, tcsetattr, thread, fork, system                         always
 *   timer         its id is -1, as a system may number it; what was wished for is written into the file
 *   memory        for what is as large as the picture
 *   inflate-init, inflate                                              always
 *
 * What is opened, and with which flags, is added to the file opened, while that is there.
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdarg.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#define FAIL "/handset/fail/"
#define PICTURE_SIZE (346 * 390 * 2)
#define STREAM_DAMAGED (-3)
#define STREAM_MEMORY (-4)
#define REFUSED "\r\nREFUSED"
#define OTHER(type, name, ...) ((type(*)(__VA_ARGS__))dlsym(RTLD_NEXT, name))

void *__libc_malloc(size_t size);

/* Whether the call is to fail; errno is its then. */
static int is_to_fail(const char *path, int error)
{
    const int saved_errno = errno;
    const int is_there = access(path, F_OK) == 0;
    errno = is_there ? error : saved_errno;
    return is_there;
}

static int is_master(int descriptor)
{
    char path[48];
    char target[64] = "";
    snprintf(path, sizeof(path), "/proc/self/fd/%d", descriptor);
    return readlink(path, target, sizeof(target) - 1) > 0 && strstr(target, "ptmx") != NULL;
}

ssize_t read(int descriptor, void *buffer, size_t size)
{
    if (is_to_fail(FAIL "app-empty", 0) && is_master(descriptor)) {
        return 0;
    }
    const ssize_t count = OTHER(ssize_t, "read", int, void *, size_t)(descriptor, buffer, size);
    if (count > 0 && is_master(descriptor) && is_to_fail(FAIL "app-read", ENODEV)) {
        return -1;
    }
    return count;
}

ssize_t write(int descriptor, const void *data, size_t size)
{
    if (size >= strlen(REFUSED) && memcmp(data, REFUSED, strlen(REFUSED)) == 0 &&
        is_to_fail(FAIL "station", ENOSPC))
    {
        return -1;
    }
    return OTHER(ssize_t, "write", int, const void *, size_t)(descriptor, data, size);
}

ssize_t recv(int descriptor, void *buffer, size_t size, int flags)
{
    const ssize_t count = OTHER(ssize_t, "recv", int, void *, size_t, int)(descriptor, buffer, size, flags);
    return is_to_fail(FAIL "event", ENOBUFS) ? -1 : count;
}

/* What the file holds; empty without one. */
static void get_wish(const char *path, char *text, size_t size)
{
    const int descriptor = open(path, O_RDONLY | O_CLOEXEC);
    text[0] = '\0';
    if (descriptor >= 0) {
        const ssize_t count = OTHER(ssize_t, "read", int, void *, size_t)(descriptor, text, size - 1);
        text[count < 0 ? 0 : count] = '\0';
        close(descriptor);
    }
}

static int is_unopenable(const char *path)
{
    char wanted[128];
    get_wish(FAIL "fopen", wanted, sizeof(wanted));
    return wanted[0] != '\0' && strcmp(path, wanted) == 0;
}

int ptsname_r(int descriptor, char *name, size_t size)
{
    get_wish(FAIL "pts-name", name, size);
    return name[0] != '\0' ? 0 : OTHER(int, "ptsname_r", int, char *, size_t)(descriptor, name, size);
}

FILE *fopen(const char *path, const char *mode)
{
    if (is_unopenable(path)) {
        errno = EMFILE;
        return NULL;
    }
    return OTHER(FILE *, "fopen", const char *, const char *)(path, mode);
}

static void note_opened(const char *path, int flags)
{
    char line[128];
    const int saved_errno = errno;
    const int note = OTHER(int, "open", const char *, int, ...)(FAIL "opened", O_WRONLY | O_APPEND | O_CLOEXEC);
    if (note >= 0) {
        const int length = snprintf(line, sizeof(line), "%s %o\n", path, (unsigned)flags);
        const ssize_t written = OTHER(ssize_t, "write", int, const void *, size_t)(note, line, (size_t)length);
        (void)written;
        close(note);
    }
    errno = saved_errno;
}

int open(const char *path, int flags, ...)
{
    va_list arguments;
    va_start(arguments, flags);
    const int mode = va_arg(arguments, int);
    va_end(arguments);
    note_opened(path, flags);
    if (strcmp(path, "/dev/ptmx") == 0 && is_to_fail(FAIL "ptmx", ENOSPC)) {
        return -1;
    }
    const int descriptor = OTHER(int, "open", const char *, int, ...)(path, flags, mode);
    if (descriptor > 0 && strcmp(path, "/dev/video0") == 0 && is_to_fail(FAIL "camera", errno)) {
        dup2(descriptor, 0);
        close(descriptor);
        return 0;
    }
    return descriptor;
}

int tcgetattr(int descriptor, void *attributes)
{
    return is_to_fail(FAIL "tcgetattr", EIO) ? -1 : OTHER(int, "tcgetattr", int, void *)(descriptor, attributes);
}

int tcsetattr(int descriptor, int when, const void *attributes)
{
    return is_to_fail(FAIL "tcsetattr", EIO)
               ? -1
               : OTHER(int, "tcsetattr", int, int, const void *)(descriptor, when, attributes);
}

int pthread_create(void *thread, const void *attributes, void *(*body)(void *), void *argument)
{
    const int saved_errno = errno;
    if (is_to_fail(FAIL "thread", saved_errno)) {
        return EAGAIN;
    }
    return OTHER(int, "pthread_create", void *, const void *, void *(*)(void *), void *)(thread, attributes,
                                                                                         body, argument);
}

pid_t fork(void)
{
    return is_to_fail(FAIL "fork", EAGAIN) ? -1 : OTHER(pid_t, "fork", void)();
}

int system(const char *command)
{
    return is_to_fail(FAIL "system", EAGAIN) ? -1 : OTHER(int, "system", const char *)(command);
}

int timer_create(int clock, struct sigevent *event, void **timer)
{
    const int saved_errno = errno;
    if (!is_to_fail(FAIL "timer", saved_errno)) {
        return OTHER(int, "timer_create", int, struct sigevent *, void **)(clock, event, timer);
    }
    FILE *stream = OTHER(FILE *, "fopen", const char *, const char *)(FAIL "timer", "w");
    if (stream != NULL) {
        fprintf(stream, "clock %d notify %d signal %d value %d attributes %p\n", clock, event->sigev_notify,
                event->sigev_signo, event->sigev_value.sival_int, event->sigev_notify_attributes);
        fclose(stream);
    }
    *timer = (void *)-1L;
    return 0;
}

void *malloc(size_t size)
{
    return size == PICTURE_SIZE && is_to_fail(FAIL "memory", ENOMEM) ? NULL : __libc_malloc(size);
}

int inflateInit2_(void *stream, int bits, const char *version, int size)
{
    return is_to_fail(FAIL "inflate-init", ENOMEM)
               ? STREAM_MEMORY
               : OTHER(int, "inflateInit2_", void *, int, const char *, int)(stream, bits, version, size);
}

int inflate(void *stream, int flush)
{
    return is_to_fail(FAIL "inflate", 0) ? STREAM_DAMAGED : OTHER(int, "inflate", void *, int)(stream, flush);
}
