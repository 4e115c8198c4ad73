#pragma once

#include <stddef.h>
#include <stdint.h>

/*
 * What all stand-ins of the platform share: where they are steered from, the record of calls, the scripted
 * answers.
 *
 * Nothing here allocates or takes a lock of this process, so a stand-in may be called from a signal handler
 * and its thread may be ended in the middle of a call.
 */

/* Interfaces of a stand-in are marked with this; everything else in its library stays inside. */
#define STAND_IN_INTERFACE extern "C" __attribute__((visibility("default")))

/* Environment variables that say where a stand-in finds its files; without them it is silently off. */
#define STAND_IN_LOG        "VX_HOST_LOG"
#define STAND_IN_PROPERTIES "VX_HOST_PROPERTIES"
#define STAND_IN_CALLS      "VX_HOST_CALLS"
#define STAND_IN_ANSWERS    "VX_HOST_ANSWERS"
#define STAND_IN_DEVICES    "VX_HOST_DEVICES"

constexpr uint32_t STAND_IN_PATH_SIZE = 512;
/* One scripted line; a device-information text fits, also one that is too long. */
constexpr uint32_t STAND_IN_LINE_SIZE = 8192;

/* One scripted answer. */
struct stand_in_answer_st
{
    bool m_is_scripted;                /* false: there is no script for this function */
    int32_t m_return;                  /* the value to return; 0 without a script */
    char m_rest_a[STAND_IN_LINE_SIZE]; /* what follows it on the line, blanks before it removed */
};

/* The value of an environment variable; null when it is unset or empty. */
const char *stand_in_setting(const char *variable);

/* Puts "<directory of the variable>/<name>" into path (STAND_IN_PATH_SIZE bytes). False when off or too long.
 */
bool stand_in_path(char *path, const char *variable, const char *name);

/* Reads a whole file, cut to capacity - 1 bytes and terminated. The length, or -1. */
int32_t stand_in_read_file(const char *path, char *text, uint32_t capacity);

/* Replaces a file in one step: a reader sees the old or the new text. 0 or -1. */
int32_t stand_in_replace_file(const char *path, const char *text, uint32_t length);

/*
 * Makes text fit one line, in place: line feeds become "\n", carriage returns "\r" (two characters each).
 * What does not fit the capacity is cut. Returns the new length; text is not terminated by it.
 */
uint32_t stand_in_escape(char *text, uint32_t length, uint32_t capacity);

/* Appends one line to the record of calls. Preserves errno. */
void stand_in_record(const char *format, ...) __attribute__((format(printf, 1, 2)));

/*
 * Takes the next line scripted for a function. Calls are counted over all processes; the n-th takes line n
 * and the last line stays. A script that was changed starts over at its first line. Returns answer->m_return.
 * Preserves errno.
 */
int32_t stand_in_take_answer(const char *function, stand_in_answer_st *answer);

/*
 * The number at a place (0 or 1) after the return value of an answer. Without it: the default when the call
 * succeeds, and what a failing call leaves alone, kept, when it does not.
 */
int32_t stand_in_out_value(const stand_in_answer_st *answer, uint32_t place, int32_t plausible, int32_t kept);

/* The error number that an answer names after its return value, as a number or a name (ENODEV); else
 * fallback. */
int32_t stand_in_error_number(const stand_in_answer_st *answer, int32_t fallback);

/* Takes the answer of a function that only returns a number, records the call with its arguments, returns the
 * number. */
int32_t stand_in_answer_call(const char *function, const char *arguments);
