#include "tests/fuzz/support/kept-log.h"

#include <stdarg.h>
#include <stdio.h>

#include "platform/include/android/log.h"
#include "tests/fuzz/support/input.h"

namespace {

std::vector<std::string> g_texts;

} // namespace

std::vector<std::string> kept_log_take()
{
    std::vector<std::string> taken;
    taken.swap(g_texts);
    return taken;
}

/* Takes the place of the platform's log: every text is kept whole, whatever its length. */
extern "C" int __android_log_print(int priority, const char *, const char *format, ...)
{
    FUZZ_REQUIRE(priority == ANDROID_LOG_DEBUG);
    char text_a[16384];
    va_list args;
    va_start(args, format);
    const int length = vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    FUZZ_REQUIRE(length >= 0 && static_cast<size_t>(length) < sizeof(text_a));
    g_texts.emplace_back(text_a);
    return length;
}
