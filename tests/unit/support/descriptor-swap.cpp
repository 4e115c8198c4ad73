#include "tests/unit/support/descriptor-swap.h"

#include <unistd.h>

#include <gtest/gtest.h>

namespace {

void put(int fd, int other_fd)
{
    if (other_fd < 0) {
        close(fd);
        return;
    }
    EXPECT_EQ(dup2(other_fd, fd), fd);
}

} // namespace

descriptor_swap_c::descriptor_swap_c(int fd, int other_fd) : m_fd(fd), m_saved_fd(dup(fd))
{
    put(m_fd, other_fd);
}

descriptor_swap_c::~descriptor_swap_c()
{
    put(m_fd, m_saved_fd);
    if (m_saved_fd >= 0) {
        close(m_saved_fd);
    }
}
