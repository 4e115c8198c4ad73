#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include "platform/host/stand-in/stand-in.h"

/*
 * The handset's player: amt-audio SAMPLE-RATE FORMAT FRAME-COUNT FILE. It puts itself into the background and
 * records its process id. It plays until it is killed, until its scripted number of seconds is over, or until
 * a later player took the sound device over, which shows in the pid file.
 */

namespace {

constexpr char PID_FILE[] = "/tmp/amt-audio.pid";
constexpr int PARAMETER_COUNT = 5;
constexpr int USAGE_STATUS = 2;
constexpr long LOOK_PAUSE_NS = 100'000'000;

/* The process id in the pid file; 0 without one. */
long recorded_pid()
{
    char text_a[32];
    return stand_in_read_file(PID_FILE, text_a, sizeof(text_a)) > 0 ? strtol(text_a, nullptr, 10) : 0;
}

bool record_pid(pid_t pid)
{
    char text_a[32];
    const int length = snprintf(text_a, sizeof(text_a), "%d\n", pid);
    return stand_in_replace_file(PID_FILE, text_a, static_cast<uint32_t>(length)) == 0;
}

/* A player keeps nothing of whoever started it: no line stays open because a sound is playing. */
void leave_starter()
{
    setsid();
    const int null_fd = open("/dev/null", O_RDWR);
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; fd++) {
        dup2(null_fd, fd);
    }
    close_range(STDERR_FILENO + 1, ~0U, 0);
    signal(SIGHUP, SIG_DFL);
}

int64_t monotonic_ms()
{
    struct timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return int64_t{now.tv_sec} * 1000 + now.tv_nsec / 1000000;
}

/* Plays for a number of seconds; 0: without an end. */
void play(int32_t seconds)
{
    const long own_pid = getpid();
    const int64_t end_ms = monotonic_ms() + int64_t{seconds} * 1000;
    for (;;) {
        const struct timespec pause = {0, LOOK_PAUSE_NS};
        nanosleep(&pause, nullptr);
        const long pid = recorded_pid();
        if (pid != 0 && pid != own_pid) {
            return;
        }
        if (seconds != 0 && monotonic_ms() >= end_ms) {
            if (pid == own_pid) {
                unlink(PID_FILE);
            }
            return;
        }
    }
}

} // namespace

int main(int argc, char **argv)
{
    if (argc != PARAMETER_COUNT) {
        fprintf(stderr, "usage: amt-audio SAMPLE-RATE FORMAT FRAME-COUNT FILE\n");
        return USAGE_STATUS;
    }
    stand_in_answer_st answer;
    const int32_t status = stand_in_take_answer("amt-audio", &answer);
    stand_in_record("amt-audio(%s, %s, %s, %s) = %d", argv[1], argv[2], argv[3], argv[4], status);
    if (status != 0) {
        return status;
    }
    /* The player starts when its id is on record, so that nobody finds it running without one. */
    int start_a[2];
    if (pipe2(start_a, O_CLOEXEC) != 0) {
        perror("amt-audio: pipe");
        return EXIT_FAILURE;
    }
    const pid_t pid = fork();
    if (pid < 0) {
        perror("amt-audio: fork");
        return EXIT_FAILURE;
    }
    if (pid == 0) {
        char go = 0;
        close(start_a[1]);
        if (read(start_a[0], &go, sizeof(go)) == sizeof(go)) {
            leave_starter();
            play(stand_in_out_value(&answer, 0, 0, 0));
        }
        _exit(EXIT_SUCCESS);
    }
    if (!record_pid(pid)) {
        perror("amt-audio: pid file");
        return EXIT_FAILURE; /* the child sees the pipe's end and leaves */
    }
    const bool is_started = write(start_a[1], "g", 1) == 1;
    return is_started ? EXIT_SUCCESS : EXIT_FAILURE;
}
