#pragma once

#include <stdint.h>

/* A function of the program's table of addresses, and what stands there in its place. */
struct torture_stand_in_st
{
    const char *m_name;
    void *m_address;
};

/* All of them, in the order of their numbers, and how many there are. */
extern const torture_stand_in_st g_torture_stand_in_a[];
extern const uint32_t g_torture_stand_in_count;
