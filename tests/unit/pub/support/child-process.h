#pragma once

#include <functional>
#include <stdint.h>
#include <string>
#include <sys/types.h>

#include "tests/unit/pub/support/lines.h"

/* A system call that the kernel is told to refuse. */
struct failing_call_st
{
    long m_number; /* 0: none */
    int m_errno;
    bool m_is_one_request = false; /* only when the second argument is this */
    uint32_t m_request = 0;
};

/* What a function did in a process of its own. */
struct child_run_st
{
    bool m_is_complete; /* false when this system lets no call be refused, or the child died */
    int m_result;
    lines_t m_text_list; /* log texts, without line numbers */
};

/*
 * Runs body in a child process, with the given call refused, and reports its result and its log texts. For
 * what would change or break the test process itself.
 */
child_run_st run_in_child(const std::function<int()> &body, const failing_call_st &failing_call = {});

/* Another program, started with a chosen command line and ended with this object. */
class other_program_c {
public:
    /* Runs "sleep 60" with program as first argument; with is_exited it has ended, but is not waited for yet.
     */
    explicit other_program_c(const std::string &program, bool is_exited = false);
    ~other_program_c();
    other_program_c(const other_program_c &) = delete;
    other_program_c &operator=(const other_program_c &) = delete;

    pid_t pid() const;

private:
    pid_t m_pid;
};
