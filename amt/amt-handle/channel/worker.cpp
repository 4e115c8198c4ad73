#include "amt/amt-handle/channel/worker.h"

#include <signal.h>

#include "pub/util/thread-end.h"
#include "pub/util/util.h"

namespace {

/* How long a stop waits for a worker that is in the middle of a request, in milliseconds. */
constexpr uint32_t STOP_PATIENCE_MS = 200;

pthread_key_t g_end_key;
bool g_has_end_key = false;

/* Held while a thread is created: it must find its id stored, whatever it does first. */
pthread_mutex_t g_start_lock = PTHREAD_MUTEX_INITIALIZER;

/* The id of a thread that has ended, by whose signal ever, must not be stopped any more. */
void mark_ended(void *argument)
{
    auto *const worker_ptr = static_cast<amt_worker_st *>(argument);
    worker_ptr->m_id.store(0);
    worker_ptr->m_is_alive.store(0, std::memory_order_release);
}

/* A key's destructor runs however a thread ends; a destructor on its stack would not when it ends by
 * pthread_exit. */
void create_end_key()
{
    if (!g_has_end_key) {
        g_has_end_key = pthread_key_create(&g_end_key, mark_ended) == 0;
    }
}

sigset_t get_end_signal()
{
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGUSR1);
    return set;
}

/* Begins with the end signal blocked: a thread that ended before it has a name would never be known to. */
void *run(void *argument)
{
    auto *worker_ptr = static_cast<amt_worker_st *>(argument);
    pub_util_defer_thread_end();
    pthread_setspecific(g_end_key, worker_ptr);
    const sigset_t end_signal = get_end_signal();
    pthread_sigmask(SIG_UNBLOCK, &end_signal, nullptr);
    pthread_mutex_lock(&g_start_lock);
    pthread_mutex_unlock(&g_start_lock);
    worker_ptr->m_loop();
    return nullptr;
}

int create_detached(amt_worker_st *worker_ptr)
{
    pthread_attr_t attr;
    pthread_attr_init(&attr);
    pthread_attr_setdetachstate(&attr, PTHREAD_CREATE_DETACHED);
    const sigset_t end_signal = get_end_signal();
    sigset_t own_mask;
    pthread_sigmask(SIG_BLOCK, &end_signal, &own_mask);
    pthread_mutex_lock(&g_start_lock);
    pthread_t id = 0;
    const int error = pthread_create(&id, &attr, run, worker_ptr);
    worker_ptr->m_id.store(error == 0 ? id : 0);
    worker_ptr->m_is_alive.store(error == 0 ? 1 : 0);
    pthread_mutex_unlock(&g_start_lock);
    pthread_sigmask(SIG_SETMASK, &own_mask, nullptr);
    pthread_attr_destroy(&attr);
    return error;
}

} // namespace

int amt_worker_start(amt_worker_st *worker_ptr, void (*loop)())
{
    create_end_key();
    /* Installed before the thread exists: a stop that comes first must not end the whole process. */
    signal(SIGUSR1, pub_util_handle_thread_signal);
    worker_ptr->m_loop = loop;
    return create_detached(worker_ptr);
}

void amt_worker_stop(amt_worker_st *worker_ptr)
{
    pthread_t id = worker_ptr->m_id.exchange(0);
    const bool is_other_thread = id != 0 && pthread_equal(id, pthread_self()) == 0;
    pub_util_kill_thread(&id);
    /* What an ended worker has done is seen from here on, hence the look even when there is nothing to wait
     * for. */
    for (uint32_t i = 0; worker_ptr->m_is_alive.load(std::memory_order_acquire) != 0; i++) {
        if (!is_other_thread || i == STOP_PATIENCE_MS) {
            return;
        }
        pub_util_sleep_ms(1);
    }
}

void amt_worker_leave(amt_worker_st *worker_ptr)
{
    if (worker_ptr->m_id.exchange(0) != 0 || worker_ptr->m_is_alive == 0) {
        return;
    }
    for (;;) {
        pub_util_sleep_ms(1000);
    }
}
