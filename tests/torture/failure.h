#pragma once

#include <stdint.h>
#include <sys/types.h>
#include <type_traits>

#include <errno.h>

#include "tests/torture/page.h"

/* The page, or null in a program that is left alone. Set before any stand-in can be called. */
extern torture_page_st *g_torture_page_ptr;

/* Where the program lies in memory. */
struct torture_program_st
{
    uintptr_t m_base;
    uintptr_t m_size;
};
extern torture_program_st g_torture_program;

/* The offset of an address in the program; 0 when it lies elsewhere. */
uint32_t torture_get_offset(const void *address);

/* Whether this is the process that is counted: a child of it is not. */
bool torture_is_counted();

/*
 * Takes a call down: the function's place in the page's names, and the address behind the call. Returns whether it
 * is the one that fails.
 */
bool torture_is_struck(uint32_t function, const void *return_address);

/* From now on the calls of this thread are those of a thread made with what lies at that offset. */
void torture_name_thread(uint32_t offset);

/* What the failing call gives: the page's result, and its errno. */
template <typename T> T torture_give()
{
    errno = g_torture_page_ptr->m_errno;
    const auto result = static_cast<intptr_t>(g_torture_page_ptr->m_result);
    if constexpr (std::is_pointer_v<T>) {
        return reinterpret_cast<T>(result);
    } else {
        return static_cast<T>(result);
    }
}
