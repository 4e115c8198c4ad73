#pragma once

#include <string>

/*
 * A tty of the modem: a pseudo-terminal, raw, whose far end the test holds. Both ends stay open, so that what
 * is said is kept until it is read.
 */
class modem_pty_c {
public:
    modem_pty_c();
    ~modem_pty_c();
    modem_pty_c(const modem_pty_c &) = delete;
    modem_pty_c &operator=(const modem_pty_c &) = delete;

    /* The name under which the daemon opens it. */
    std::string path() const;

    /* The modem says text. */
    void say(const std::string &text) const;

    /* What the modem has been told so far, size bytes of it; fails the test when less comes in 10 s. */
    std::string hear(size_t size) const;

    /* Whether nothing more has been said to it. */
    bool is_quiet() const;

private:
    int m_master_fd;
    int m_slave_fd;
};

/* A descriptor, the caller's, of a tty that has been hung up. */
int open_lost_tty();
