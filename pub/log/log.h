#pragma once

#include <errno.h> // IWYU pragma: export: most texts show it
#include <initializer_list>
#include <stdint.h>

#include "platform/include/android/log.h"

/*
 * Log texts: one record a call, at debug priority.
 *
 * All operations preserve errno, so a run of lines about one failure shows the failing call's errno in each
 * of them. They may be called from a signal handler: a record that would interrupt the same thread in the
 * middle of another record is dropped instead of waiting for a lock that its own thread holds.
 *
 * What the guard knows of a thread is made by the thread's first record, or by pub_log_prepare_thread before
 * a handler could be the first to log there.
 */

/* Where a record comes from: the log tag (null: none) and the source name shown in error lines. */
struct pub_log_source_st
{
    const char *m_tag_ptr;
    const char *m_name_ptr;
};

/*
 * Where a failure is told from: the source, and what the error line names: by themselves the function and the
 * line that call. {source, "func"} names another function, {source, func, line} what a helper was given.
 */
struct pub_log_place_st
{
    const pub_log_source_st &m_source;
    const char *m_func_ptr;
    int m_line;

    constexpr pub_log_place_st(const pub_log_source_st &source, const char *func = __builtin_FUNCTION(),
                               int line = __builtin_LINE())
        : m_source(source), m_func_ptr(func), m_line(line)
    {
    }
};

/* A dump shows this many bytes, then "...". */
constexpr uint32_t PUB_LOG_DUMP_SIZE = 250;

/* Makes the guard's record of the calling thread. */
void pub_log_prepare_thread();

/* The entry line of the calling function: "func()". */
void pub_log_entry(const pub_log_source_st &source, const char *func = __builtin_FUNCTION());

/*
 * The error line, with the source's name, the place's line and function, the code and errno. This and the
 * next three return error_code, so that a function can return what it logs.
 */
int pub_log_error(const pub_log_place_st &place, int error_code);

/* The error line, then a line of text, cut at 4351 characters. */
int pub_log_fail(const pub_log_place_st &place, int error_code, const char *format, ...)
    __attribute__((format(printf, 3, 4)));

/* The error line and that of a failed system call, in the order of the names. */
int pub_log_error_call(const pub_log_place_st &place, int error_code, const char *call);
int pub_log_call_error(const pub_log_place_st &place, const char *call, int error_code);

/* The line of a failed system call, with errno. */
void pub_log_sys_call(const pub_log_source_st &source, const char *call);

/* The line of tested arguments, separated by ", ": 1 where a test found a fault. At most 8 of them. */
void pub_log_flags(const pub_log_source_st &source, std::initializer_list<bool> fault_list);

/* A refused call: the error line with PUB_ERR_PARAM, then the line of flags. Returns PUB_ERR_PARAM. */
int pub_log_bad_param(const pub_log_place_st &place, std::initializer_list<bool> fault_list);

/* Channel traffic: title, length and the first PUB_LOG_DUMP_SIZE bytes in hexadecimal. */
void pub_log_dump(const pub_log_source_st &source, const char *title, const uint8_t *data, uint32_t length);

/*
 * The guard around a record, for PUB_LOG alone. Whether this thread may write one now, which it may not in the
 * middle of another; if so, pub_log_end must follow and brings back the errno that pub_log_begin has found.
 */
bool pub_log_begin();
void pub_log_end();

/* One record of free text. The platform's log formats it: doing so here first would cost as much again. */
#define PUB_LOG(source, ...)                                                                                 \
    (pub_log_begin()                                                                                         \
         ? (__android_log_print(ANDROID_LOG_DEBUG, (source).m_tag_ptr, __VA_ARGS__), pub_log_end())          \
         : static_cast<void>(0))
