#pragma once

/*
 * While it lives, descriptor number fd is what other_fd is, or is closed where other_fd is negative. Then it
 * is what it was before.
 */
class descriptor_swap_c {
public:
    descriptor_swap_c(int fd, int other_fd);
    ~descriptor_swap_c();
    descriptor_swap_c(const descriptor_swap_c &) = delete;
    descriptor_swap_c &operator=(const descriptor_swap_c &) = delete;

private:
    int m_fd;
    int m_saved_fd; /* negative where there was nothing */
};
