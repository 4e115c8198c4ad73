#include "tests/fuzz/support/handset-files.h"

#include <errno.h>
#include <fcntl.h>
#include <map>
#include <stdio.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include "tests/fuzz/support/input.h"

/* The linker sends the calls here (--wrap), and what is not about a handset's file back to where they belong. */
extern "C" {
FILE *__real_fopen(const char *path, const char *mode);
FILE *__wrap_fopen(const char *path, const char *mode);
int __real_system(const char *command);
int __real_access(const char *path, int mode);
int __wrap_access(const char *path, int mode);
int __wrap_system(const char *command);
int __wrap_reboot(int command);
void __wrap__Z17pub_util_sleep_msj(uint32_t ms);
}

namespace {

constexpr const char *ROOT_LIST[] = {"/amt/", "/data/", "/mnt/", "/sys/", "/system/"};

/* A file is a descriptor of memory. */
std::map<std::string, int> g_files;
uint32_t g_power_offs = 0;
bool g_is_there = false;
void (*g_pause)(uint32_t ms) = nullptr;

bool is_handsets(const char *path)
{
    if (!g_is_there) {
        return false;
    }
    for (const char *root : ROOT_LIST) {
        if (strncmp(path, root, strlen(root)) == 0) {
            return true;
        }
    }
    return false;
}

int make_file(const std::string &path)
{
    const auto found = g_files.find(path);
    if (found != g_files.end()) {
        return found->second;
    }
    const int fd = memfd_create("handset", MFD_CLOEXEC);
    FUZZ_REQUIRE(fd >= 0);
    g_files[path] = fd;
    return fd;
}

/* A descriptor's own file, opened again: with a place of its own in it. */
FILE *open_again(int fd, const char *mode)
{
    char path_a[32];
    snprintf(path_a, sizeof(path_a), "/proc/self/fd/%d", fd);
    return __real_fopen(path_a, mode);
}

} // namespace

void handset_files_begin()
{
    g_is_there = true;
    g_power_offs = 0;
}

void handset_files_end()
{
    for (const auto &file : g_files) {
        close(file.second);
    }
    g_files.clear();
    g_pause = nullptr;
    g_is_there = false;
}

void handset_files_put(const std::string &path, const std::string &content)
{
    const int fd = make_file(path);
    FUZZ_REQUIRE(ftruncate(fd, 0) == 0);
    FUZZ_REQUIRE(pwrite(fd, content.data(), content.size(), 0) == static_cast<ssize_t>(content.size()));
}

bool handset_files_get(const std::string &path, std::string *content_ptr)
{
    content_ptr->clear();
    const auto found = g_files.find(path);
    if (found == g_files.end()) {
        return false;
    }
    char chunk_a[4096];
    ssize_t count = 0;
    while ((count = pread(found->second, chunk_a, sizeof(chunk_a), static_cast<off_t>(content_ptr->size()))) >
           0) {
        content_ptr->append(chunk_a, static_cast<size_t>(count));
    }
    return true;
}

void handset_files_set_pause(void (*pause)(uint32_t ms))
{
    g_pause = pause;
}

uint32_t handset_files_power_offs()
{
    return g_power_offs;
}

FILE *__wrap_fopen(const char *path, const char *mode)
{
    if (!is_handsets(path)) {
        return __real_fopen(path, mode);
    }
    const bool is_there = g_files.count(path) != 0;
    if (!is_there && mode[0] == 'r') {
        errno = ENOENT;
        return nullptr;
    }
    return open_again(make_file(path), mode);
}

int __wrap_access(const char *path, int mode)
{
    if (g_is_there && strcmp(path, "/amt") == 0) {
        return 0;
    }
    if (!is_handsets(path)) {
        return __real_access(path, mode);
    }
    if (g_files.count(path) != 0) {
        return 0;
    }
    errno = ENOENT;
    return -1;
}

int __wrap_system(const char *command)
{
    if (!g_is_there) {
        return __real_system(command);
    }
    FUZZ_REQUIRE(command != nullptr && *command != '\0');
    return 0;
}

int __wrap_reboot(int)
{
    g_power_offs++;
    return 0;
}

void __wrap__Z17pub_util_sleep_msj(uint32_t ms)
{
    if (g_pause != nullptr) {
        g_pause(ms);
    }
}
