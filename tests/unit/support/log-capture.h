#pragma once

#include <string>
#include <vector>

/* One record of the platform's log, as the code under test wrote it. */
struct log_record_st
{
    int m_priority;
    std::string m_tag; /* "(null)" for a null tag */
    std::string m_text;
};

/*
 * Takes the place of the platform's log in the unit tests: while an object of this class lives, every record
 * of every thread is kept in it. One at a time.
 */
class log_capture_c {
public:
    log_capture_c();
    ~log_capture_c();
    log_capture_c(const log_capture_c &) = delete;
    log_capture_c &operator=(const log_capture_c &) = delete;

    std::vector<log_record_st> records() const;

    /* The texts alone, in order. */
    std::vector<std::string> texts() const;

    /* Whether some record has exactly this text. */
    bool has(const std::string &text) const;

    /* How many records contain this text. */
    int count_containing(const std::string &part) const;
};
