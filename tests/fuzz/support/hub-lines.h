#pragma once

#include <optional>
#include <stdint.h>
#include <string>

/*
 * The two lines of the PC path with this process at their far ends. Each piece that is said on one end is one read
 * on the other, and each write one piece.
 */
class hub_lines_c {
public:
    hub_lines_c();
    ~hub_lines_c();
    hub_lines_c(const hub_lines_c &) = delete;
    hub_lines_c &operator=(const hub_lines_c &) = delete;

    /* The PC, or the modem, says something; behind it the line has nothing more to read. */
    void say_pc(const std::string &text);
    void say_modem(const std::string &text);

    /* Nobody says anything: the next read of the PC's line brings nothing. */
    void be_silent();

    /* The next piece that was written to the PC, or to the modem; nothing when there is none. */
    std::optional<std::string> heard_by_pc();
    std::optional<std::string> heard_by_modem();

private:
    int m_pc_fd;
    int m_modem_fd;
};
