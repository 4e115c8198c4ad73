#pragma once

#include <errno.h>
#include <initializer_list>
#include <stdint.h>

#include "platform/include/android/log.h"

/*
 * Every log text of the daemon and its library is made here: one record a call, at debug priority.
 *
 * All operations preserve errno, so a run of lines about one failure shows the failing call's errno in each
 * of them. They may be called from a signal handler: a record that would interrupt the same thread in the
 * middle of another record is dropped instead of waiting for a lock that its own thread holds.
 */

/* Where a record comes from: the log tag and the source name shown in error lines. */
struct pub_log_source_st
{
    const char *m_tag_ptr;
    const char *m_name_ptr;
};

inline constexpr pub_log_source_st g_pub_cfg_log{"vx-kel-pub", "cfg/cfg"};
inline constexpr pub_log_source_st g_pub_util_log{"vx-kel-pub", "util/util"};
inline constexpr pub_log_source_st g_pub_pty_log{"vx-kel-pub", "pty/pty"};

/* A dump shows this many bytes, then "...". */
constexpr uint32_t PUB_LOG_DUMP_SIZE = 250;

/* One record of free text under the given tag; a null tag is legal. */
void pub_log_print(const char *tag, const char *format, ...) __attribute__((format(printf, 2, 3)));

/* The entry line: "func()". */
void pub_log_entry(const pub_log_source_st &source, const char *func);

/* The error line, with the source's name, the line, the function, the code and errno. */
void pub_log_error(const pub_log_source_st &source, int line, const char *func, int error_code);

/* The line of a failed system call, with errno. */
void pub_log_sys_call(const pub_log_source_st &source, const char *call);

/* The line of tested arguments, separated by ", ": 1 where a test found a fault. At most 8 of them. */
void pub_log_flags(const pub_log_source_st &source, std::initializer_list<bool> fault_list);

/* Channel traffic: title, length and the first PUB_LOG_DUMP_SIZE bytes in hexadecimal. */
void pub_log_dump(const pub_log_source_st &source, const char *title, const uint8_t *data, uint32_t length);

/* Whether this thread may write a record now; if so, pub_log_end must follow it. */
bool pub_log_begin();
void pub_log_end();

/* Runs print, which writes one record, unless it interrupts another record of the same thread. */
template <typename print_func> void pub_log_guarded(print_func print)
{
    const int saved_errno = errno;
    if (pub_log_begin()) {
        print();
        pub_log_end();
    }
    errno = saved_errno;
}

/* One record of free text. The platform's log formats it: doing so here first would cost as much again. */
#define PUB_LOG(source, ...)                                                                                 \
    pub_log_guarded([&] { __android_log_print(ANDROID_LOG_DEBUG, (source).m_tag_ptr, __VA_ARGS__); })
#define PUB_LOG_ENTRY(source)          pub_log_entry(source, __func__)
#define PUB_LOG_ERROR(source, code)    pub_log_error(source, __LINE__, __func__, code)
#define PUB_LOG_SYS_CALL(source, call) pub_log_sys_call(source, call)
#define PUB_LOG_FLAGS(source, ...)     pub_log_flags(source, {__VA_ARGS__})
