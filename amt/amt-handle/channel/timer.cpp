#include "amt/amt-handle/channel/timer.h"

#include <errno.h>
#include <string.h>
#include <time.h>

#include "amt/amt-log.h"

namespace {

constexpr intptr_t NOT_ARMED = -1;

/* What the timer service is handed along; no receiver looks at them. */
constexpr int TIMER_SIGNAL = 32;
constexpr int TIMER_VALUE = 111;

timer_t to_handle(intptr_t id)
{
    return reinterpret_cast<timer_t>(id); // NOLINT(performance-no-int-to-ptr): the kernel counts them
}

/* The log shows the id as a 32-bit number. */
int to_log_id(intptr_t id)
{
    return static_cast<int>(id);
}

} // namespace

void amt_timer_create(amt_timer_st *timer_ptr, amt_timer_func callback)
{
    if (timer_ptr->m_id != NOT_ARMED) {
        amt_timer_delete(timer_ptr);
    }
    sigevent event = {};
    event.sigev_notify = SIGEV_THREAD;
    event.sigev_signo = TIMER_SIGNAL;
    event.sigev_value.sival_int = TIMER_VALUE;
    event.sigev_notify_function = callback;
    timer_t handle = nullptr;
    if (timer_create(CLOCK_REALTIME, &event, &handle) != 0) {
        PUB_LOG(g_amt_handle_log, "timer_create, error: %d - %s", errno, strerror(errno));
        return;
    }
    const auto id = reinterpret_cast<intptr_t>(handle);
    if (id == NOT_ARMED) {
        PUB_LOG(g_amt_handle_log, "timer_create, error, id is -1.");
        return;
    }
    timer_ptr->m_id = id;
    PUB_LOG(g_amt_handle_log, "createTimer success, timerId[%d]", to_log_id(id));
}

void amt_timer_set(amt_timer_st *timer_ptr, int32_t time_ms)
{
    const intptr_t id = timer_ptr->m_id;
    if (id == NOT_ARMED) {
        PUB_LOG(g_amt_handle_log, "invalid parameter.timerId:%d; timeMSec:%d.", to_log_id(id), time_ms);
        return;
    }
    itimerspec time = {};
    time.it_value.tv_sec = time_ms / 1000;
    time.it_value.tv_nsec = static_cast<long>(time_ms % 1000) * 1000000;
    if (timer_settime(to_handle(id), 0, &time, nullptr) != 0) {
        PUB_LOG(g_amt_handle_log, "timer_settime errorr: %d - %s", errno, strerror(errno));
    }
    PUB_LOG(g_amt_handle_log, "setTimer success, timerId[%d], timeMSec:%d. ", to_log_id(id), time_ms);
}

void amt_timer_delete(amt_timer_st *timer_ptr)
{
    const intptr_t id = timer_ptr->m_id.exchange(NOT_ARMED);
    if (id != NOT_ARMED) {
        PUB_LOG(g_amt_handle_log, "delete timer.timerId:%d.", to_log_id(id));
        timer_delete(to_handle(id));
    }
    PUB_LOG(g_amt_handle_log, "deleteTimer success, timerId[%d]", to_log_id(timer_ptr->m_id));
}
