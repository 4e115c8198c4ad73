/*
 * Preloaded into the daemon of a simulated handset, this library makes one call of the daemon fail: the Nth of a
 * function from one place of the program on one thread. What the daemon calls is listed for the tester.
 *
 * It takes the place of the functions in the program's own table of addresses and nowhere else: what the C library
 * and the platform's libraries call among themselves is as usual, and so is what this library calls.
 */
#include <fcntl.h>
#include <link.h>
#include <stdio.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include "tests/torture/failure.h"
#include "tests/torture/stand-ins.h"

namespace {

constexpr char PROGRAM[] = "/vx-kel-amt";

/* What the program's dynamic section says about its table of addresses. */
struct tables_st
{
    const ElfW(Sym) * m_symbol_ptr;
    const char *m_text_ptr;
    uintptr_t m_jump_place;
    uintptr_t m_jump_size;
    uintptr_t m_data_place;
    uintptr_t m_data_size;
    size_t m_entry_size;
};

/* Some loaders have added the program's place already. */
uintptr_t to_address(uintptr_t value)
{
    return value < g_torture_program.m_base ? value + g_torture_program.m_base : value;
}

template <typename object> object *to_object(uintptr_t place)
{
    return reinterpret_cast<object *>(place); // NOLINT(performance-no-int-to-ptr): a table of addresses
}

void take_entry(const ElfW(Dyn) & entry, tables_st *tables_ptr)
{
    switch (entry.d_tag) {
    case DT_SYMTAB:
        tables_ptr->m_symbol_ptr = to_object<const ElfW(Sym)>(to_address(entry.d_un.d_ptr));
        break;
    case DT_STRTAB:
        tables_ptr->m_text_ptr = to_object<const char>(to_address(entry.d_un.d_ptr));
        break;
    case DT_JMPREL:
        tables_ptr->m_jump_place = to_address(entry.d_un.d_ptr);
        break;
    case DT_PLTRELSZ:
        tables_ptr->m_jump_size = entry.d_un.d_val;
        break;
    case DT_RELA:
    case DT_REL:
        tables_ptr->m_data_place = to_address(entry.d_un.d_ptr);
        break;
    case DT_RELASZ:
    case DT_RELSZ:
        tables_ptr->m_data_size = entry.d_un.d_val;
        break;
    case DT_PLTREL:
        tables_ptr->m_entry_size = entry.d_un.d_val == DT_RELA ? sizeof(ElfW(Rela)) : sizeof(ElfW(Rel));
        break;
    default:
        break;
    }
}

void *find_stand_in(const char *name)
{
    for (uint32_t i = 0; i < g_torture_stand_in_count; i++) {
        if (strcmp(g_torture_stand_in_a[i].m_name, name) == 0) {
            return g_torture_stand_in_a[i].m_address;
        }
    }
    return nullptr;
}

/* A table that the loader has closed behind itself is opened for this one word. */
void put_address(uintptr_t place, void *address)
{
    const auto size = static_cast<uintptr_t>(sysconf(_SC_PAGESIZE));
    mprotect(to_object<void>(place & ~(size - 1)), size, PROT_READ | PROT_WRITE);
    *to_object<void *>(place) = address;
}

/* Both kinds of entries begin in the same way: where the address stands, and whose it is. */
void replace(const tables_st &tables, uintptr_t place, uintptr_t size)
{
    for (uintptr_t i = 0; i < size; i += tables.m_entry_size) {
        const auto *const entry_ptr = to_object<const ElfW(Rel)>(place + i);
#if __SIZEOF_POINTER__ == 8
        const auto symbol = ELF64_R_SYM(entry_ptr->r_info);
#else
        const auto symbol = ELF32_R_SYM(entry_ptr->r_info);
#endif
        void *const stand_in =
            symbol != 0 ? find_stand_in(tables.m_text_ptr + tables.m_symbol_ptr[symbol].st_name) : nullptr;
        if (stand_in != nullptr) {
            put_address(g_torture_program.m_base + entry_ptr->r_offset, stand_in);
        }
    }
}

/* The program is the first that the loader tells of. */
int take_program(dl_phdr_info *info_ptr, size_t, void *)
{
    g_torture_program.m_base = info_ptr->dlpi_addr;
    tables_st tables = {};
    for (uint32_t i = 0; i < info_ptr->dlpi_phnum; i++) {
        const ElfW(Phdr) &part = info_ptr->dlpi_phdr[i];
        if (part.p_type == PT_LOAD) {
            g_torture_program.m_size = part.p_vaddr + part.p_memsz;
        }
        if (part.p_type == PT_DYNAMIC) {
            const auto *entry_ptr = to_object<const ElfW(Dyn)>(info_ptr->dlpi_addr + part.p_vaddr);
            for (; entry_ptr->d_tag != DT_NULL; entry_ptr++) {
                take_entry(*entry_ptr, &tables);
            }
        }
    }
    replace(tables, tables.m_jump_place, tables.m_jump_size);
    replace(tables, tables.m_data_place, tables.m_data_size);
    return 1;
}

bool is_daemon()
{
    char path_a[256];
    const ssize_t length = readlink("/proc/self/exe", path_a, sizeof(path_a) - 1);
    const auto name_length = static_cast<ssize_t>(sizeof(PROGRAM) - 1);
    return length >= name_length && memcmp(path_a + length - name_length, PROGRAM, sizeof(PROGRAM) - 1) == 0;
}

torture_page_st *map_page()
{
    const int fd = open(TORTURE_PAGE_PATH, O_RDWR | O_CLOEXEC);
    if (fd < 0) {
        return nullptr;
    }
    void *const memory = mmap(nullptr, sizeof(torture_page_st), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    close(fd);
    return memory == MAP_FAILED ? nullptr : static_cast<torture_page_st *>(memory);
}

/* The programs that the daemon starts are loaded with this library, too, and left alone. */
__attribute__((constructor)) void begin()
{
    torture_page_st *const page_ptr = is_daemon() ? map_page() : nullptr;
    if (page_ptr == nullptr) {
        return;
    }
    for (uint32_t i = 0; i < g_torture_stand_in_count; i++) {
        snprintf(page_ptr->m_name_a[i], TORTURE_NAME_SIZE, "%s", g_torture_stand_in_a[i].m_name);
    }
    for (auto &count : page_ptr->m_waiting_a) {
        count = 0;
    }
    page_ptr->m_pid = static_cast<uint32_t>(getpid());
    g_torture_page_ptr = page_ptr;
    dl_iterate_phdr(take_program, nullptr);
    page_ptr->m_magic = TORTURE_MAGIC;
}

} // namespace
