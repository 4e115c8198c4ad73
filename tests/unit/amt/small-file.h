#pragma once

#include <sys/resource.h>

#include "tests/unit/support/temp-folder.h"

/*
 * A file that, like no other as long as this lives, may not grow beyond so many bytes: what is written to it
 * is written in part.
 */
class small_file_c {
public:
    explicit small_file_c(rlim_t size);
    ~small_file_c();
    small_file_c(const small_file_c &) = delete;
    small_file_c &operator=(const small_file_c &) = delete;

    int fd() const;

private:
    temp_folder_c m_folder;
    rlimit m_limit;
    int m_fd;
    void (*m_handler_ptr)(int);
};
