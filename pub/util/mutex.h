#pragma once

#include <pthread.h>

/*
 * A mutex for std::lock_guard that reports nothing. The library's own throws when it cannot be locked, and for
 * that alone the service would have to load the whole C++ library: it uses nothing else that is not inline.
 *
 * A thread that locks one it holds already waits for ever; try_lock, however, it may ask, and is refused.
 */
class pub_mutex_c {
public:
    void lock()
    {
        pthread_mutex_lock(&m_mutex);
    }
    void unlock()
    {
        pthread_mutex_unlock(&m_mutex);
    }

    /* Whether it is the caller's now. */
    bool try_lock()
    {
        return pthread_mutex_trylock(&m_mutex) == 0;
    }

private:
    pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
};
