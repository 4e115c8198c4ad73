#pragma once

#include <functional>
#include <string>
#include <vector>

#include <stdint.h>

/*
 * Takes the place of the connectivity test library in the unit tests: while an object of this class lives,
 * every call is noted as "name(arguments)" (a pointer as "out" or "null") and answered as the fields say. One
 * at a time; without one, every call fails with -9.
 */
class radio_library_c {
public:
    radio_library_c();
    ~radio_library_c();
    radio_library_c(const radio_library_c &) = delete;
    radio_library_c &operator=(const radio_library_c &) = delete;

    int32_t m_answer = 0; /* of every call */
    int32_t m_count = 0;  /* what a stopped reception has counted */
    int32_t m_svid = 0;   /* what reading a signal stores */
    int32_t m_cnr = 0;
    std::function<void()> m_in_call; /* run inside every call, when set */
    std::vector<std::string> m_calls;

    /* The calls so far; they are forgotten. */
    std::vector<std::string> take_calls();
};
