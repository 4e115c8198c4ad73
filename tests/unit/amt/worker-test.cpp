#include "amt/amt-handle/channel/worker.h"

#include <atomic>
#include <cerrno>
#include <chrono>
#include <signal.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/wait.h"
#include "pub/util/thread-end.h"
#include "tests/unit/amt/thread-creation.h"
#include "tests/unit/support/log-capture.h"

namespace {

using steady_clock_t = std::chrono::steady_clock;

constexpr int STEP_STARTED = 1;
constexpr int STEP_RETURNED = 2;
constexpr unsigned int DEADLINE_SECONDS = 30;
constexpr long STOP_PATIENCE_MS = 200;

/* Records live as long as the process, as the hub's do: a thread may still be leaving when its test is over.
 */
amt_worker_st g_worker_a[20];
uint32_t g_worker_count = 0;
amt_worker_st *g_worker_ptr;

std::atomic<int> g_step{0};
std::atomic<int> g_released{0};
std::atomic<int> g_is_looked_at{0}; /* the record of the worker that has just been started */
int g_pipe_a[2];

long elapsed_ms(steady_clock_t::time_point start)
{
    return static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(steady_clock_t::now() - start).count());
}

template <typename value_t> void wait_for(const std::atomic<value_t> &value, value_t wanted)
{
    while (value != wanted) {
        usleep(1000);
    }
}

class worker : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_LT(g_worker_count, std::size(g_worker_a));
        g_worker_ptr = &g_worker_a[g_worker_count++];
        g_step = 0;
        g_released = 0;
        g_is_looked_at = 0;
        ASSERT_EQ(pipe(g_pipe_a), 0);
        alarm(DEADLINE_SECONDS);
    }
    void TearDown() override
    {
        alarm(0);
        close(g_pipe_a[0]);
        close(g_pipe_a[1]);
    }

    static void start(void (*loop)())
    {
        ASSERT_EQ(amt_worker_start(g_worker_ptr, loop), 0);
        EXPECT_NE(g_worker_ptr->m_id.load(), 0U);
        EXPECT_EQ(g_worker_ptr->m_is_alive, 1);
        g_is_looked_at = 1;
        wait_for(g_step, STEP_STARTED);
    }

    static void expect_ended()
    {
        wait_for(g_worker_ptr->m_is_alive, 0);
        EXPECT_EQ(g_worker_ptr->m_id.load(), 0U);
    }
};

/*
 * ThreadSanitizer makes its record of a thread's signals with the thread's first call that waits, and loses a
 * signal that comes at that very moment.
 */
void say_started()
{
    usleep(1);
    g_step = STEP_STARTED;
}

void wait_for_ever()
{
    say_started();
    while (amt_wait_readable(g_pipe_a[0], 600000) <= 0) {
    }
    g_step = STEP_RETURNED;
}

void sleep_for_ever()
{
    say_started();
    pub_util_sleep_ms(600000);
    g_step = STEP_RETURNED;
}

void work_until_released()
{
    say_started();
    wait_for(g_released, 1);
    g_step = STEP_RETURNED;
    pub_util_sleep_ms(600000);
}

void note_deferral()
{
    wait_for(g_is_looked_at, 1);
    g_released = pub_util_is_thread_end_deferred() ? 1 : 2;
    g_step = STEP_STARTED;
}

void leave_and_work_on()
{
    wait_for(g_is_looked_at, 1);
    amt_worker_leave(g_worker_ptr);
    g_step = STEP_STARTED;
    wait_for(g_released, 1);
    g_step = STEP_RETURNED;
}

void leave_when_released()
{
    say_started();
    wait_for(g_released, 1);
    amt_worker_leave(g_worker_ptr);
    g_step = STEP_RETURNED;
}

TEST_F(worker, starts_with_its_end_deferred_and_ends_by_itself)
{
    start(note_deferral);
    EXPECT_EQ(g_released, 1);
    expect_ended();
}

TEST_F(worker, is_stopped_in_a_wait)
{
    for (void (*const loop)() : {wait_for_ever, sleep_for_ever}) {
        g_step = 0;
        start(loop);
        const auto begin = steady_clock_t::now();
        amt_worker_stop(g_worker_ptr);
        /* On a busy machine its patience may end before the thread does. */
        EXPECT_TRUE(g_worker_ptr->m_is_alive == 0 || elapsed_ms(begin) >= STOP_PATIENCE_MS);
        EXPECT_EQ(g_worker_ptr->m_id.load(), 0U);
        expect_ended();
        EXPECT_EQ(g_step, STEP_STARTED);
    }
}

TEST_F(worker, finishes_its_work_before_a_stop_ends_it)
{
    start(work_until_released);
    pthread_t helper = 0;
    ASSERT_EQ(pthread_create(
                  &helper, nullptr,
                  [](void *) -> void * {
                      usleep(50000);
                      g_released = 1;
                      return nullptr;
                  },
                  nullptr),
              0);
    amt_worker_stop(g_worker_ptr);
    pthread_join(helper, nullptr);
    expect_ended();
    EXPECT_EQ(g_step, STEP_RETURNED);
}

TEST_F(worker, is_waited_for_only_so_long)
{
    start(work_until_released);
    const auto begin = steady_clock_t::now();
    amt_worker_stop(g_worker_ptr);
    EXPECT_GE(elapsed_ms(begin), STOP_PATIENCE_MS);
    EXPECT_EQ(g_worker_ptr->m_is_alive, 1);
    EXPECT_EQ(g_worker_ptr->m_id.load(), 0U);
    /* The stop still holds: it ends at its next wait. */
    g_released = 1;
    expect_ended();
    EXPECT_EQ(g_step, STEP_RETURNED);
}

TEST_F(worker, that_never_ran_is_not_stopped)
{
    const log_capture_c capture;
    const auto begin = steady_clock_t::now();
    amt_worker_stop(g_worker_ptr);
    EXPECT_LT(elapsed_ms(begin), 100);
    EXPECT_EQ(capture.texts(), std::vector<std::string>{});
}

TEST_F(worker, that_is_leaving_is_not_stopped_any_more)
{
    start([] { leave_and_work_on(); });
    EXPECT_EQ(g_worker_ptr->m_id.load(), 0U);
    const log_capture_c capture;
    amt_worker_stop(g_worker_ptr);
    g_released = 1;
    wait_for(g_step, STEP_RETURNED);
    expect_ended();
    EXPECT_EQ(capture.count_containing("will be end"), 0);
}

TEST_F(worker, that_leaves_while_it_is_stopped_ends_there)
{
    start(leave_when_released);
    const pthread_t id = g_worker_ptr->m_id.exchange(0); /* as the stop does first */
    g_released = 1;
    usleep(20000);
    EXPECT_EQ(g_step, STEP_STARTED);
    EXPECT_EQ(g_worker_ptr->m_is_alive, 1);
    EXPECT_EQ(pthread_kill(id, SIGUSR1), 0);
    expect_ended();
    EXPECT_EQ(g_step, STEP_STARTED);
}

TEST_F(worker, ended_by_a_foreign_signal_is_known_to_be_gone)
{
    start(sleep_for_ever);
    EXPECT_EQ(pthread_kill(g_worker_ptr->m_id, SIGUSR1), 0);
    expect_ended();
    const log_capture_c capture;
    amt_worker_stop(g_worker_ptr);
    EXPECT_EQ(capture.texts(), std::vector<std::string>{});
}

TEST_F(worker, does_not_stop_itself)
{
    start([] {
        wait_for(g_is_looked_at, 1);
        amt_worker_stop(g_worker_ptr);
        g_step = STEP_STARTED;
        wait_for(g_released, 1);
        g_step = STEP_RETURNED;
    });
    g_released = 1;
    wait_for(g_step, STEP_RETURNED);
    expect_ended();
}

TEST_F(worker, that_ends_at_once_is_not_entered_after_its_end)
{
    for (int i = 0; i < 200; i++) {
        ASSERT_EQ(amt_worker_start(g_worker_ptr, [] {}), 0);
        expect_ended();
    }
}

TEST_F(worker, begins_with_an_empty_mask_whatever_its_starter_blocks)
{
    sigset_t all;
    sigset_t own_mask;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &own_mask);
    ASSERT_EQ(amt_worker_start(g_worker_ptr,
                               [] {
                                   sigset_t mask;
                                   pthread_sigmask(SIG_SETMASK, nullptr, &mask);
                                   for (int i = 1; i < NSIG; i++) {
                                       g_released = g_released + (sigismember(&mask, i) == 1 ? 1 : 0);
                                   }
                                   g_step = STEP_RETURNED;
                               }),
              0);
    wait_for(g_step, STEP_RETURNED);
    sigset_t starters_mask;
    pthread_sigmask(SIG_SETMASK, &own_mask, &starters_mask);
    EXPECT_EQ(sigismember(&starters_mask, SIGTERM), 1) << "the starter's own is as it was";
    EXPECT_EQ(g_released, 0);
    expect_ended();
}

TEST_F(worker, leaves_its_starter_the_signals_that_it_takes)
{
    ASSERT_EQ(amt_worker_start(g_worker_ptr, [] { g_step = STEP_RETURNED; }), 0);
    sigset_t mask;
    pthread_sigmask(SIG_SETMASK, nullptr, &mask);
    EXPECT_EQ(sigismember(&mask, SIGUSR1), 0);
    wait_for(g_step, STEP_RETURNED);
    expect_ended();
}

TEST_F(worker, can_be_stopped_as_soon_as_it_is_started)
{
#ifdef __SANITIZE_THREAD__
    GTEST_SKIP() << "the sanitizer may lose a signal in a thread's first moments";
#endif
    for (int i = 0; i < 50; i++) {
        ASSERT_EQ(amt_worker_start(g_worker_ptr, sleep_for_ever), 0);
        amt_worker_stop(g_worker_ptr);
        expect_ended();
    }
}

TEST_F(worker, that_cannot_be_created_is_none)
{
    {
        const no_threads_c nothing;
        EXPECT_EQ(amt_worker_start(g_worker_ptr, sleep_for_ever), EAGAIN);
    }
    EXPECT_EQ(g_worker_ptr->m_id.load(), 0U);
    EXPECT_EQ(g_worker_ptr->m_is_alive, 0);
}

/* While a start has made a thread, but not yet written down which one, the record is nobody else's. */
constexpr useconds_t START_US = 50000;

TEST_F(worker, that_leaves_before_its_start_is_over_waits_for_it)
{
    thread_creation_pause_once([] {
        wait_for(g_step, STEP_STARTED);
        usleep(START_US);
    });
    ASSERT_EQ(amt_worker_start(g_worker_ptr,
                               [] {
                                   g_step = STEP_STARTED;
                                   amt_worker_leave(g_worker_ptr);
                                   g_released = g_worker_ptr->m_is_alive == 1 ? 1 : 2;
                                   g_step = STEP_RETURNED;
                               }),
              0);
    wait_for(g_step, STEP_RETURNED);
    EXPECT_EQ(g_released, 1) << "it has left what was not there yet";
    expect_ended();
}

TEST_F(worker, that_ends_before_its_start_is_over_leaves_no_record)
{
    thread_creation_pause_once([] {
        wait_for(g_step, STEP_STARTED);
        usleep(START_US);
    });
    ASSERT_EQ(amt_worker_start(g_worker_ptr, [] { g_step = STEP_STARTED; }), 0);
    expect_ended();
}

TEST_F(worker, that_is_stopped_before_its_start_is_over_is_stopped)
{
    std::thread starter([] {
        thread_creation_pause_once([] {
            wait_for(g_released, 1);
            usleep(START_US);
        });
        EXPECT_EQ(amt_worker_start(g_worker_ptr, wait_for_ever), 0);
    });
    wait_for(g_step, STEP_STARTED);
    g_released = 1;
    amt_worker_stop(g_worker_ptr);
    starter.join();
    expect_ended();
    EXPECT_EQ(g_step, STEP_STARTED);
}

} // namespace
