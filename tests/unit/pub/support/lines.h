#pragma once

#include <string>
#include <vector>

#include "tests/unit/support/log-lines.h"

using lines_t = std::vector<std::string>;

/* The line of a failed system call. */
inline std::string sys_call_line(const std::string &call, int error_number)
{
    return "sys call: " + call + "() failed! errno = " + std::to_string(error_number);
}

/* Both lists, one after the other. */
inline lines_t operator+(lines_t left, const lines_t &right)
{
    left.insert(left.end(), right.begin(), right.end());
    return left;
}
