#include "pub/log/print.h"

#include <errno.h>
#include <string>
#include <unistd.h>

#include <gtest/gtest.h>

namespace {

/* Puts another descriptor in the place of standard output while it lives. */
class stdout_swap_c {
public:
    explicit stdout_swap_c(int fd) : m_saved_fd(dup(STDOUT_FILENO))
    {
        fd < 0 ? close(STDOUT_FILENO) : dup2(fd, STDOUT_FILENO);
    }
    ~stdout_swap_c()
    {
        dup2(m_saved_fd, STDOUT_FILENO);
        close(m_saved_fd);
    }
    stdout_swap_c(const stdout_swap_c &) = delete;
    stdout_swap_c &operator=(const stdout_swap_c &) = delete;

private:
    int m_saved_fd;
};

class print : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_EQ(pipe(m_pipe_a), 0);
    }
    void TearDown() override
    {
        close(m_pipe_a[0]);
        close(m_pipe_a[1]);
    }
    /* What is in the pipe now; the caller has written something. */
    std::string take() const
    {
        char buf_a[16384];
        const ssize_t count = read(m_pipe_a[0], buf_a, sizeof(buf_a));
        return {buf_a, static_cast<size_t>(count > 0 ? count : 0)};
    }

    int m_pipe_a[2] = {-1, -1};
};

} // namespace

TEST_F(print, text_is_in_the_pipe_at_once)
{
    const stdout_swap_c swap(m_pipe_a[1]);
    pub_print("no line end yet: %d", 5);
    EXPECT_EQ(take(), "no line end yet: 5");
    pub_print("%s", "one line\n");
    EXPECT_EQ(take(), "one line\n");
}

TEST_F(print, long_text_is_cut_at_4607_bytes)
{
    const stdout_swap_c swap(m_pipe_a[1]);
    pub_print("%s", std::string(4607, 'a').c_str());
    EXPECT_EQ(take(), std::string(4607, 'a'));
    pub_print("%s", std::string(4608, 'b').c_str());
    EXPECT_EQ(take(), std::string(4607, 'b'));
}

TEST_F(print, errno_survives_a_closed_output)
{
    const stdout_swap_c swap(-1);
    errno = EXDEV;
    pub_print("lost");
    EXPECT_EQ(errno, EXDEV);
}

TEST_F(print, empty_text_writes_nothing)
{
    const stdout_swap_c swap(m_pipe_a[1]);
    pub_print("%s", "");
    pub_print("next");
    EXPECT_EQ(take(), "next");
}
