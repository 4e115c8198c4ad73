#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdio.h>
#include <string>
#include <vector>

#include "tests/fuzz/support/input.h"

/*
 * Runs a target over files and directories of inputs, for builds without the fuzzing engine. Ends with 1 when
 * there is nothing to run; a finding ends the process by a signal.
 */
namespace {

std::vector<std::string> list_inputs(int argc, char **argv)
{
    std::vector<std::string> path_list;
    for (int i = 1; i < argc; i++) {
        if (!std::filesystem::is_directory(argv[i])) {
            path_list.emplace_back(argv[i]);
            continue;
        }
        for (const auto &entry : std::filesystem::directory_iterator(argv[i])) {
            path_list.push_back(entry.path());
        }
    }
    return path_list;
}

} // namespace

int main(int argc, char **argv)
{
    const std::vector<std::string> path_list = list_inputs(argc, argv);
    for (const std::string &path : path_list) {
        std::ifstream stream(path, std::ios::binary);
        if (!stream) {
            fprintf(stderr, "cannot read %s\n", path.c_str());
            return 1;
        }
        const std::vector<char> content{std::istreambuf_iterator<char>(stream), {}};
        fprintf(stderr, "%s (%zu bytes)\n", path.c_str(), content.size());
        /* A copy of exact size on the heap: a read behind it is seen. */
        const std::vector<uint8_t> input(content.begin(), content.end());
        LLVMFuzzerTestOneInput(input.data(), input.size());
    }
    fprintf(stderr, "%zu inputs\n", path_list.size());
    return path_list.empty() ? 1 : 0;
}
