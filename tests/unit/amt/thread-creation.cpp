#include "tests/unit/amt/thread-creation.h"

#include <atomic>
#include <cerrno>
#include <dlfcn.h>
#include <pthread.h>
#include <utility>

namespace {

std::atomic<bool> g_is_without_threads{false};
thread_local void (*t_pause)() = nullptr;

} // namespace

no_threads_c::no_threads_c()
{
    g_is_without_threads = true;
}

no_threads_c::~no_threads_c()
{
    g_is_without_threads = false;
}

void thread_creation_pause_once(void (*pause)())
{
    t_pause = pause;
}

extern "C" int pthread_create(pthread_t *id_ptr, const pthread_attr_t *attributes_ptr, void *(*body)(void *),
                              void *argument)
{
    if (g_is_without_threads) {
        return EAGAIN;
    }
    using create_func = int (*)(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);
    static const create_func next = reinterpret_cast<create_func>(dlsym(RTLD_NEXT, "pthread_create"));
    const int error = next(id_ptr, attributes_ptr, body, argument);
    if (void (*const pause)() = std::exchange(t_pause, nullptr); pause != nullptr) {
        pause();
    }
    return error;
}
