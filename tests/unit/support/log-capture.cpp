#include "tests/unit/support/log-capture.h"

#include <algorithm>
#include <errno.h>
#include <mutex>
#include <stdarg.h>
#include <stdio.h>

#include "platform/include/android/log.h"

namespace {

std::mutex g_lock;
std::vector<log_record_st> g_records;
bool g_is_capturing = false;

} // namespace

extern "C" int __android_log_print(int priority, const char *tag, const char *format, ...)
{
    char text_a[8192];
    va_list args;
    va_start(args, format);
    const int length = vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    {
        const std::lock_guard<std::mutex> guard(g_lock);
        if (g_is_capturing) {
            g_records.push_back({priority, tag == nullptr ? "(null)" : tag, text_a});
        }
    }
    /* A log call may do this, and the next line must show the failing call's errno all the same. */
    errno = EOWNERDEAD;
    return length;
}

log_capture_c::log_capture_c()
{
    const std::lock_guard<std::mutex> guard(g_lock);
    g_records.clear();
    g_is_capturing = true;
}

log_capture_c::~log_capture_c()
{
    const std::lock_guard<std::mutex> guard(g_lock);
    g_is_capturing = false;
}

std::vector<log_record_st> log_capture_c::records() const
{
    const std::lock_guard<std::mutex> guard(g_lock);
    return g_records;
}

std::vector<std::string> log_capture_c::texts() const
{
    std::vector<std::string> text_list;
    for (const log_record_st &record : records()) {
        text_list.push_back(record.m_text);
    }
    return text_list;
}

bool log_capture_c::has(const std::string &text) const
{
    const std::vector<std::string> text_list = texts();
    return std::find(text_list.begin(), text_list.end(), text) != text_list.end();
}

int log_capture_c::count_containing(const std::string &part) const
{
    int count = 0;
    for (const std::string &text : texts()) {
        count += text.find(part) != std::string::npos ? 1 : 0;
    }
    return count;
}
