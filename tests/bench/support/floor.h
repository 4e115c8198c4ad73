#pragma once

#include <stddef.h>
#include <stdint.h>
#include <string>

/*
 * What an answer costs at least: a process that waits for the request, writes the answer's frames down, and in
 * between formats and writes the log records (and progress texts) of the daemon for that very request, in its
 * order, with every argument ready. It looks for nothing, decides nothing and keeps nothing.
 */
struct floor_st
{
    const char *m_name_ptr;
    std::string m_request;
    size_t m_response_length;
    uint32_t m_record_count;

    /* One request that has been read from line is answered there; another line leads to the modem. */
    void (*m_answer)(int line, int modem);
};

/* The floor of this name; ends the program when there is none. */
const floor_st &find_floor(const char *name);

/* Answers for ever what comes on the line, one read a request. */
[[noreturn]] void run_floor(const floor_st &floor, int line, int modem);
