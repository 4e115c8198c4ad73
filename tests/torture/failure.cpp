#include "tests/torture/failure.h"

#include <string.h>
#include <unistd.h>

torture_page_st *g_torture_page_ptr;
torture_program_st g_torture_program;

namespace {

thread_local uint32_t t_thread;

bool is_wanted(uint32_t function, uint32_t site)
{
    const torture_page_st &page = *g_torture_page_ptr;
    return page.m_thread == t_thread && site >= page.m_low && site < page.m_high &&
           strncmp(page.m_function_a, page.m_name_a[function], TORTURE_NAME_SIZE) == 0;
}

} // namespace

uint32_t torture_get_offset(const void *address)
{
    const uintptr_t offset = reinterpret_cast<uintptr_t>(address) - g_torture_program.m_base;
    return offset < g_torture_program.m_size ? static_cast<uint32_t>(offset) : 0;
}

bool torture_is_counted()
{
    return static_cast<uint32_t>(getpid()) == g_torture_page_ptr->m_pid;
}

void torture_name_thread(uint32_t offset)
{
    t_thread = offset;
}

bool torture_is_struck(uint32_t function, const void *return_address)
{
    if (!torture_is_counted()) {
        return false;
    }
    torture_page_st *const page_ptr = g_torture_page_ptr;
    /* The call is the instruction that ends there; what follows it may be another function already. */
    const uint32_t site = torture_get_offset(return_address) - 1;
    const uint32_t place = page_ptr->m_call_count.fetch_add(1);
    if (place < TORTURE_CALL_COUNT) {
        page_ptr->m_call_a[place] = {function, site, t_thread};
    }
    if (page_ptr->m_nth == 0 || !is_wanted(function, site) || page_ptr->m_nth.fetch_sub(1) != 1) {
        return false;
    }
    page_ptr->m_fired = 1;
    return true;
}
