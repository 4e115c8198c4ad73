#pragma once

#include <atomic>
#include <stdint.h>

/*
 * What the preloaded library and the tester share: a file of the handset that both have mapped. The tester reads
 * and writes it by its layout (tools/torture/page.py), so that the order of the fields is their meaning.
 */
constexpr char TORTURE_PAGE_PATH[] = "/handset/torture";
constexpr uint32_t TORTURE_MAGIC = 0x544F5254;
constexpr uint32_t TORTURE_NAME_SIZE = 24;
constexpr uint32_t TORTURE_NAME_COUNT = 64;
constexpr uint32_t TORTURE_FD_COUNT = 64;
constexpr uint32_t TORTURE_CALL_COUNT = 16384;

/* How a call fails. */
enum class torture_mode_en : uint32_t
{
    RESULT = 0, /* it does nothing, and gives a result and an errno */
    SHORT = 1   /* it does a part of what it was asked for */
};

/* A call of the daemon: of which function, from where in the program, on which thread. */
struct torture_call_st
{
    uint32_t m_function; /* place in m_name_a */
    uint32_t m_site;     /* offset in the program */
    uint32_t m_thread;   /* what the thread was made with, an offset in the program; 0: the main thread */
};

struct torture_page_st
{
    uint32_t m_magic; /* set by the library when the names are there */
    uint32_t m_pid;
    char m_name_a[TORTURE_NAME_COUNT][TORTURE_NAME_SIZE];

    /* What is to fail, there before m_nth is: calls of a function from [low, high) on a thread. */
    char m_function_a[TORTURE_NAME_SIZE];
    uint32_t m_low;
    uint32_t m_high;
    uint32_t m_thread;
    torture_mode_en m_mode;
    int32_t m_result;
    int32_t m_errno;
    std::atomic<uint32_t> m_nth;   /* counts down; the call that makes it 0 fails */
    std::atomic<uint32_t> m_fired; /* whether that has happened */

    std::atomic<uint32_t> m_consumed;                    /* bytes that read() has given */
    std::atomic<uint32_t> m_waiting_a[TORTURE_FD_COUNT]; /* threads that wait for a descriptor */
    std::atomic<uint32_t> m_call_count;                  /* of all calls; the first ones are listed */
    torture_call_st m_call_a[TORTURE_CALL_COUNT];
};
