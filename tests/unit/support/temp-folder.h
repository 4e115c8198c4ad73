#pragma once

#include <string>

/* A folder of its own for a test, removed with everything in it at the end. */
class temp_folder_c {
public:
    temp_folder_c();
    ~temp_folder_c();
    temp_folder_c(const temp_folder_c &) = delete;
    temp_folder_c &operator=(const temp_folder_c &) = delete;

    /* The path of something of this name in the folder. */
    std::string path(const std::string &name) const;

private:
    std::string m_path;
};

/* The whole content of a file; "(missing)" when it cannot be read. */
std::string read_whole_file(const std::string &path);

/* Creates or replaces a file. */
void write_whole_file(const std::string &path, const std::string &content);
