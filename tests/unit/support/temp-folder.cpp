#include "tests/unit/support/temp-folder.h"

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdlib.h>
#include <system_error>

temp_folder_c::temp_folder_c()
    : m_path((std::filesystem::temp_directory_path() / "vx-kel-test-XXXXXX").string())
{
    if (mkdtemp(m_path.data()) == nullptr) {
        abort();
    }
}

temp_folder_c::~temp_folder_c()
{
    std::error_code ignored;
    std::filesystem::remove_all(m_path, ignored);
}

std::string temp_folder_c::path(const std::string &name) const
{
    return m_path + "/" + name;
}

std::string read_whole_file(const std::string &path)
{
    std::ifstream stream(path, std::ios::binary);
    if (!stream) {
        return "(missing)";
    }
    return std::string(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
}

void write_whole_file(const std::string &path, const std::string &content)
{
    std::ofstream(path, std::ios::binary) << content;
}
