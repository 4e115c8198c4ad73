#pragma once

#include <string>
#include <vector>

/*
 * Takes the place of system() while an object of this class lives: commands are noted instead of run, so that
 * a test can let code run that writes under "/". Without one, system() is the C library's. One at a time.
 */
class shell_record_c {
public:
    shell_record_c();
    ~shell_record_c();
    shell_record_c(const shell_record_c &) = delete;
    shell_record_c &operator=(const shell_record_c &) = delete;

    int m_answer = 0; /* of every command */
    int m_error = 0;  /* what every command leaves in errno, unless it is 0 */
    std::vector<std::string> m_commands;
};
