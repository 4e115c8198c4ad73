#include "amt/amt-handle/channel/worker.h"

#include <signal.h>

#include "pub/log/log.h"
#include "pub/util/signal-table.h"
#include "pub/util/thread-end.h"

namespace {

/* How long a stop waits for a worker that is in the middle of a request, in milliseconds. */
constexpr uint32_t STOP_PATIENCE_MS = 200;

/* How long a leaving worker sleeps at a time while it waits for a stop that has begun. */
constexpr uint32_t LEAVE_PAUSE_MS = 1000;

pthread_mutex_t g_record_lock = PTHREAD_MUTEX_INITIALIZER;

pthread_key_t g_end_key;
pthread_once_t g_end_key_once = PTHREAD_ONCE_INIT;

void clear_record(void *argument)
{
    auto *const worker_ptr = static_cast<amt_worker_st *>(argument);
    pthread_mutex_lock(&g_record_lock);
    worker_ptr->m_id = 0;
    worker_ptr->m_is_alive = 0;
    pthread_mutex_unlock(&g_record_lock);
}

/* A process has keys to spare when it starts: this cannot fail. */
void create_end_key()
{
    pthread_key_create(&g_end_key, clear_record);
}

void *run(void *argument)
{
    auto *const worker_ptr = static_cast<amt_worker_st *>(argument);
    pub_log_prepare_thread();
    pub_util_defer_thread_end();
    pthread_setspecific(g_end_key, worker_ptr);
    const sigset_t none = pub_util_get_signal_set({});
    pthread_sigmask(SIG_SETMASK, &none, nullptr);
    worker_ptr->m_loop();
    return nullptr;
}

int create_detached(amt_worker_st *worker_ptr)
{
    pthread_attr_t attr;
    pthread_attr_init(&attr);
    pthread_attr_setdetachstate(&attr, PTHREAD_CREATE_DETACHED);
    pthread_mutex_lock(&g_record_lock);
    pthread_t id = 0;
    const int error = pthread_create(&id, &attr, run, worker_ptr);
    worker_ptr->m_id = error == 0 ? id : 0;
    worker_ptr->m_is_alive = error == 0 ? 1 : 0;
    pthread_mutex_unlock(&g_record_lock);
    pthread_attr_destroy(&attr);
    return error;
}

/* Whether a worker other than the caller was there to be stopped. */
bool send_stop(amt_worker_st *worker_ptr)
{
    pthread_mutex_lock(&g_record_lock);
    pthread_t id = worker_ptr->m_id.exchange(0);
    const bool is_other_thread = id != 0 && pthread_equal(id, pthread_self()) == 0;
    if (is_other_thread) {
        pub_util_kill_thread(&id);
    }
    pthread_mutex_unlock(&g_record_lock);
    return is_other_thread;
}

} // namespace

int amt_worker_start(amt_worker_st *worker_ptr, void (*loop)())
{
    pthread_once(&g_end_key_once, create_end_key);
    signal(SIGUSR1, pub_util_handle_thread_signal);
    worker_ptr->m_loop = loop;
    const sigset_t end_signal = pub_util_get_signal_set({SIGUSR1});
    sigset_t own_mask;
    pthread_sigmask(SIG_BLOCK, &end_signal, &own_mask);
    const int error = create_detached(worker_ptr);
    pthread_sigmask(SIG_SETMASK, &own_mask, nullptr);
    return error;
}

void amt_worker_stop(amt_worker_st *worker_ptr)
{
    if (!send_stop(worker_ptr)) {
        return;
    }
    for (uint32_t i = 0; worker_ptr->m_is_alive != 0 && i < STOP_PATIENCE_MS; i++) {
        pub_util_sleep_ms(1);
    }
}

void amt_worker_leave(amt_worker_st *worker_ptr)
{
    pthread_mutex_lock(&g_record_lock);
    const bool is_being_stopped = worker_ptr->m_id.exchange(0) == 0 && worker_ptr->m_is_alive != 0;
    pthread_mutex_unlock(&g_record_lock);
    if (is_being_stopped) {
        for (;;) {
            pub_util_sleep_ms(LEAVE_PAUSE_MS);
        }
    }
}
