#pragma once

#include <atomic>
#include <signal.h>
#include <stdint.h>

/* A one-shot timer of the process. Its callback runs on a thread that the timer service creates. */
struct amt_timer_st
{
    std::atomic<intptr_t> m_id{-1}; /* the timer's handle; -1 when not armed */
};

using amt_timer_func = void (*)(sigval);

/* Creates the timer, deleting it first if it exists. It does not run before amt_timer_set. Failures are
 * logged. */
void amt_timer_create(amt_timer_st *timer_ptr, amt_timer_func callback);

/* Starts a created timer: it fires once after time_ms milliseconds. Failures are logged. */
void amt_timer_set(amt_timer_st *timer_ptr, int32_t time_ms);

/* Deletes the timer if it exists. Two threads may do so at once. */
void amt_timer_delete(amt_timer_st *timer_ptr);
