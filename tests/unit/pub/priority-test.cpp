#include "pub/util/util.h"

#include <errno.h>
#include <pthread.h>
#include <sched.h>
#include <string>
#include <sys/syscall.h>
#include <unistd.h>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "pub/log/log.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/log-capture.h"

namespace {

std::string priority_error(int error_number)
{
    return error_line("util/util", "pub_util_raise_process_priority", PUB_ERR_SYS_CALL, error_number);
}

/* A kernel that permits what few machines do, and keeps what it was asked for. */
std::vector<std::string> *g_permitted_ptr = nullptr;

} // namespace

extern "C" int sched_setscheduler(pid_t pid, int policy, const sched_param *param_ptr) noexcept
{
    if (g_permitted_ptr != nullptr) {
        const std::string who = pid == 0 ? "the thread" : pid == getpid() ? "the process" : "another";
        g_permitted_ptr->push_back(who + " " + std::to_string(policy) + " " +
                                   std::to_string(param_ptr->sched_priority));
        return 0;
    }
    return static_cast<int>(syscall(SYS_sched_setscheduler, pid, policy, param_ptr));
}

TEST(priority, is_asked_for_the_process_and_for_the_thread)
{
    std::vector<std::string> asked;
    const log_capture_c capture;
    g_permitted_ptr = &asked;
    const int status = pub_util_raise_process_priority();
    g_permitted_ptr = nullptr;
    EXPECT_EQ(status, PUB_ERR_NONE);
    const std::string wanted = "1 " + std::to_string(sched_get_priority_max(SCHED_FIFO) - 4);
    EXPECT_THAT(asked, testing::ElementsAre("the process " + wanted, "the thread " + wanted));
    EXPECT_THAT(capture.texts(), testing::ElementsAre("pub_util_raise_process_priority()"));
}

TEST(priority, is_real_time_four_below_the_highest)
{
    const child_run_st run = run_in_child([] {
        const int status = pub_util_raise_process_priority();
        sched_param param = {};
        sched_getparam(0, &param);
        PUB_LOG((pub_log_source_st{"", ""}), "policy %d priority %d", sched_getscheduler(0),
                param.sched_priority);
        return status;
    });
    ASSERT_TRUE(run.m_is_complete);
    if (run.m_result != PUB_ERR_NONE) {
        GTEST_SKIP() << "real-time scheduling is not permitted here";
    }
    EXPECT_THAT(
        run.m_text_list,
        testing::ElementsAre("pub_util_raise_process_priority()",
                             "policy 1 priority " + std::to_string(sched_get_priority_max(SCHED_FIFO) - 4)));
}

TEST(priority, is_the_calling_thread_s_too)
{
    const child_run_st run = run_in_child([] {
        int status = -1;
        pthread_t thread = 0;
        const auto raise = [](void *status_ptr) -> void * {
            *static_cast<int *>(status_ptr) = pub_util_raise_process_priority();
            PUB_LOG((pub_log_source_st{"", ""}), "own policy %d, process's %d", sched_getscheduler(0),
                    sched_getscheduler(getpid()));
            return nullptr;
        };
        pthread_create(&thread, nullptr, raise, &status);
        pthread_join(thread, nullptr);
        return status;
    });
    ASSERT_TRUE(run.m_is_complete);
    if (run.m_result != PUB_ERR_NONE) {
        GTEST_SKIP() << "real-time scheduling is not permitted here";
    }
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre("pub_util_raise_process_priority()", "own policy 1, process's 1"));
}

TEST(priority, refused_policy)
{
    const child_run_st run = run_in_child(&pub_util_raise_process_priority, {SYS_sched_setscheduler, EPERM});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_SYS_CALL);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre("pub_util_raise_process_priority()",
                                     sys_call_line("sched_setscheduler", EPERM), priority_error(EPERM)));
}

TEST(priority, unknown_range)
{
    const child_run_st run =
        run_in_child(&pub_util_raise_process_priority, {SYS_sched_get_priority_max, EINVAL});
    if (!run.m_is_complete) {
        GTEST_SKIP() << "no system call can be refused here";
    }
    EXPECT_EQ(run.m_result, PUB_ERR_SYS_CALL);
    EXPECT_THAT(run.m_text_list, testing::ElementsAre("pub_util_raise_process_priority()",
                                                      sys_call_line("sched_get_priority_max", EINVAL),
                                                      priority_error(EINVAL)));
}
