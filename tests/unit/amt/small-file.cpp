#include "tests/unit/amt/small-file.h"

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <gtest/gtest.h>

small_file_c::small_file_c(rlim_t size)
    : m_fd(open(m_folder.path("small").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600))
{
    EXPECT_GT(m_fd, 0);
    EXPECT_EQ(getrlimit(RLIMIT_FSIZE, &m_limit), 0);
    const rlimit limit = {size, m_limit.rlim_max};
    /* Standard output may be a file, too. */
    m_handler_ptr = signal(SIGXFSZ, SIG_IGN);
    EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
}

small_file_c::~small_file_c()
{
    setrlimit(RLIMIT_FSIZE, &m_limit);
    signal(SIGXFSZ, m_handler_ptr);
    close(m_fd);
}

int small_file_c::fd() const
{
    return m_fd;
}
