/* The platform's log (liblog). */
#pragma once

enum
{
    ANDROID_LOG_UNKNOWN = 0,
    ANDROID_LOG_DEFAULT = 1,
    ANDROID_LOG_VERBOSE = 2,
    ANDROID_LOG_DEBUG = 3,
    ANDROID_LOG_INFO = 4,
    ANDROID_LOG_WARN = 5,
    ANDROID_LOG_ERROR = 6,
    ANDROID_LOG_FATAL = 7,
    ANDROID_LOG_SILENT = 8
};

extern "C" {
/**
 * Writes one record to the log.
 * @param priority one of the constants above
 * @param tag      the source's tag; null is legal
 * @param format   printf format of the text, without a line end
 * @return the number of bytes written, or a negative value. Callable from every thread and from signal
 * handlers.
 */
int __android_log_print(int priority, const char *tag, const char *format, ...)
    __attribute__((format(printf, 3, 4)));
}
