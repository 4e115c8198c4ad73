#include "platform/host/stand-in/stand-in.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/* Walks the lines of a script, keeping the last one seen. Empty lines and comments (#) are not counted. */
struct line_walk_st
{
    char *m_line_ptr;
    uint32_t m_length; /* of the line being read */
    uint32_t m_seen;   /* complete lines */
    char m_current_a[STAND_IN_LINE_SIZE];
};

void end_line(line_walk_st *walk)
{
    const bool is_answer = walk->m_length != 0 && walk->m_current_a[0] != '#';
    if (is_answer) {
        memcpy(walk->m_line_ptr, walk->m_current_a, walk->m_length);
        walk->m_line_ptr[walk->m_length] = '\0';
        walk->m_seen++;
    }
    walk->m_length = 0;
}

/* The wanted line (counted from 1), or the last one before it, into line (STAND_IN_LINE_SIZE). False: no line
 * at all. */
bool read_line(int fd, uint32_t wanted, char *line)
{
    line_walk_st walk;
    walk.m_line_ptr = line;
    walk.m_length = 0;
    walk.m_seen = 0;
    char chunk_a[1024];
    ssize_t got = 0;
    while (walk.m_seen < wanted && (got = read(fd, chunk_a, sizeof(chunk_a))) > 0) {
        for (ssize_t i = 0; i < got && walk.m_seen < wanted; i++) {
            if (chunk_a[i] == '\n') {
                end_line(&walk);
            } else if (walk.m_length + 1 < STAND_IN_LINE_SIZE) {
                walk.m_current_a[walk.m_length++] = chunk_a[i];
            }
        }
    }
    if (walk.m_seen < wanted) {
        end_line(&walk);
    }
    return walk.m_seen != 0;
}

/*
 * The number of this call, counted from 1, kept beside the scripts in ".taken": the function may be called by
 * many short-lived processes, and by libraries that are unloaded in between. The count belongs to one state
 * of the script.
 */
uint32_t count_call(int script_fd, const char *function)
{
    char path_a[STAND_IN_PATH_SIZE];
    struct stat state;
    if (!stand_in_path(path_a, STAND_IN_ANSWERS, ".taken") || fstat(script_fd, &state) != 0) {
        return 1;
    }
    mkdir(path_a, 0777);
    const size_t directory_length = strlen(path_a);
    snprintf(path_a + directory_length, sizeof(path_a) - directory_length, "/%s", function);
    const int fd = open(path_a, O_RDWR | O_CREAT | O_CLOEXEC, 0666);
    if (fd < 0) {
        return 1;
    }
    flock(fd, LOCK_EX);

    char script_a[128];
    snprintf(script_a, sizeof(script_a), "%llu %lld.%09ld %lld ",
             static_cast<unsigned long long>(state.st_ino), static_cast<long long>(state.st_mtim.tv_sec),
             static_cast<long>(state.st_mtim.tv_nsec), static_cast<long long>(state.st_size));
    char text_a[160];
    const ssize_t got = read(fd, text_a, sizeof(text_a) - 1);
    text_a[got < 0 ? 0 : got] = '\0';
    const size_t script_length = strlen(script_a);
    const bool is_same_script = strncmp(text_a, script_a, script_length) == 0;
    const uint32_t count =
        is_same_script ? static_cast<uint32_t>(strtoul(text_a + script_length, nullptr, 10)) + 1 : 1;

    const int length = snprintf(text_a, sizeof(text_a), "%s%u\n", script_a, count);
    if (ftruncate(fd, 0) == 0) {
        const ssize_t written = pwrite(fd, text_a, static_cast<size_t>(length), 0);
        (void)written;
    }
    close(fd);
    return count;
}

void parse_line(const char *function, char *line, stand_in_answer_st *answer)
{
    char *rest = nullptr;
    const long value = strtol(line, &rest, 10);
    if (rest == line) {
        stand_in_record("# answers/%s: no return value in \"%s\"", function, line);
        return;
    }
    answer->m_is_scripted = true;
    answer->m_return = static_cast<int32_t>(value);
    rest += strspn(rest, " \t");
    size_t length = strlen(rest);
    if (length != 0 && rest[length - 1] == '\r') {
        length--;
    }
    memcpy(answer->m_rest_a, rest, length);
    answer->m_rest_a[length] = '\0';
}

} // namespace

int32_t stand_in_take_answer(const char *function, stand_in_answer_st *answer)
{
    answer->m_is_scripted = false;
    answer->m_return = 0;
    answer->m_rest_a[0] = '\0';

    const int saved_errno = errno;
    char path_a[STAND_IN_PATH_SIZE];
    const bool is_on = stand_in_path(path_a, STAND_IN_ANSWERS, function);
    const int fd = is_on ? open(path_a, O_RDONLY | O_CLOEXEC) : -1;
    if (fd >= 0) {
        /* A signal that arrived while the count's file is locked could wait for it for ever. */
        sigset_t all;
        sigset_t before;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before);
        char line_a[STAND_IN_LINE_SIZE];
        if (read_line(fd, count_call(fd, function), line_a)) {
            parse_line(function, line_a, answer);
        }
        close(fd);
        pthread_sigmask(SIG_SETMASK, &before, nullptr);
    }
    errno = saved_errno;
    return answer->m_return;
}

int32_t stand_in_out_value(const stand_in_answer_st *answer, uint32_t place, int32_t plausible, int32_t kept)
{
    const char *at = answer->m_rest_a;
    for (;;) {
        char *end = nullptr;
        const long value = strtol(at, &end, 10);
        if (end == at) {
            return answer->m_return == 0 ? plausible : kept;
        }
        if (place-- == 0) {
            return static_cast<int32_t>(value);
        }
        at = end;
    }
}

int32_t stand_in_error_number(const stand_in_answer_st *answer, int32_t fallback)
{
    char *end = nullptr;
    const long number = strtol(answer->m_rest_a, &end, 10);
    if (end != answer->m_rest_a) {
        return static_cast<int32_t>(number);
    }
    constexpr int32_t last_number = 133;
    for (int32_t i = 1; i <= last_number; i++) {
        const char *name = strerrorname_np(i);
        if (name != nullptr && strcmp(name, answer->m_rest_a) == 0) {
            return i;
        }
    }
    return fallback;
}

int32_t stand_in_answer_call(const char *function, const char *arguments)
{
    stand_in_answer_st answer;
    const int32_t status = stand_in_take_answer(function, &answer);
    stand_in_record("%s(%s) = %d", function, arguments, status);
    return status;
}
