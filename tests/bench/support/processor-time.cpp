#include "tests/bench/support/processor-time.h"

#include <dirent.h>
#include <stdio.h>
#include <string>

#include "tests/bench/support/lines.h"

namespace {

constexpr double NS_PER_US = 1000.0;

/* A thread that has ended meanwhile counts nothing. */
unsigned long long read_thread_ns(const std::string &path)
{
    unsigned long long ns = 0;
    FILE *const file = fopen(path.c_str(), "re");
    if (file != nullptr) {
        if (fscanf(file, "%llu", &ns) != 1) {
            die("the scheduler's account");
        }
        fclose(file);
    }
    return ns;
}

} // namespace

double get_processor_us(pid_t pid)
{
    const std::string folder = "/proc/" + std::to_string(pid) + "/task";
    DIR *const tasks = opendir(folder.c_str());
    if (tasks == nullptr) {
        die("the process to measure");
    }
    unsigned long long ns = 0;
    while (const dirent *entry = readdir(tasks)) {
        if (entry->d_name[0] != '.') {
            ns += read_thread_ns(folder + "/" + entry->d_name + "/schedstat");
        }
    }
    closedir(tasks);
    return static_cast<double>(ns) / NS_PER_US;
}
