#include "tests/unit/platform/support.h"

#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

const char *const g_variable_a[][2] = {
    {"VX_HOST_LOG", "log.txt"},     {"VX_HOST_PROPERTIES", "properties"}, {"VX_HOST_CALLS", "calls.txt"},
    {"VX_HOST_ANSWERS", "answers"}, {"VX_HOST_DEVICES", "devices"},
};

int exit_status(pid_t pid)
{
    int status = 0;
    waitpid(pid, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

/* Runs a program, its standard output and error collected. */
int run(const std::vector<std::string> &words, std::string *output)
{
    int pipe_a[2];
    if (pipe2(pipe_a, O_CLOEXEC) != 0) {
        return -1;
    }
    const pid_t pid = fork();
    if (pid == 0) {
        dup2(pipe_a[1], STDOUT_FILENO);
        dup2(pipe_a[1], STDERR_FILENO);
        std::vector<char *> arguments;
        arguments.reserve(words.size() + 1);
        for (const std::string &word : words) {
            arguments.push_back(const_cast<char *>(word.c_str()));
        }
        arguments.push_back(nullptr);
        execvp(arguments[0], arguments.data());
        _exit(127);
    }
    close(pipe_a[1]);
    char chunk_a[4096];
    ssize_t got = 0;
    while ((got = ::read(pipe_a[0], chunk_a, sizeof(chunk_a))) > 0) {
        output->append(chunk_a, static_cast<size_t>(got));
    }
    close(pipe_a[0]);
    return exit_status(pid);
}

void add(std::vector<std::string> *words, std::initializer_list<std::string> more)
{
    words->insert(words->end(), more);
}

} // namespace

std::vector<std::string> split_lines(const std::string &text)
{
    std::vector<std::string> result;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line, '\n');) {
        result.push_back(line);
    }
    return result;
}

stand_in_test::stand_in_test()
{
    std::string pattern = (std::filesystem::temp_directory_path() / "stand-in-test-XXXXXX").string();
    m_directory = mkdtemp(pattern.data());
    for (const char *name : {"properties", "answers", "devices"}) {
        std::filesystem::create_directory(path(name));
    }
    for (const auto &variable : g_variable_a) {
        setenv(variable[0], path(variable[1]).c_str(), 1);
    }
}

stand_in_test::~stand_in_test()
{
    for (const auto &variable : g_variable_a) {
        unsetenv(variable[0]);
    }
    std::filesystem::remove_all(m_directory);
}

std::string stand_in_test::path(const std::string &name) const
{
    return m_directory + "/" + name;
}

void stand_in_test::write(const std::string &name, const std::string &text) const
{
    std::ofstream(path(name), std::ios::binary | std::ios::trunc) << text;
}

std::string stand_in_test::read(const std::string &name) const
{
    std::ostringstream text;
    text << std::ifstream(path(name), std::ios::binary).rdbuf();
    return text.str();
}

bool stand_in_test::exists(const std::string &name) const
{
    return std::filesystem::exists(path(name));
}

std::vector<std::string> stand_in_test::lines(const std::string &name) const
{
    return split_lines(read(name));
}

std::vector<std::string> stand_in_test::calls() const
{
    return lines("calls.txt");
}

int stand_in_test::in_child(const std::function<void()> &work)
{
    const pid_t pid = fork();
    if (pid == 0) {
        work();
        _exit(testing::Test::HasFailure() ? 1 : 0);
    }
    return exit_status(pid);
}

stand_in_test::result_st stand_in_test::run_in_handset(const std::string &script) const
{
    std::vector<std::string> words = {"bwrap",
                                      "--unshare-user",
                                      "--unshare-pid",
                                      "--die-with-parent",
                                      "--ro-bind",
                                      "/",
                                      "/",
                                      "--proc",
                                      "/proc",
                                      "--dev",
                                      "/dev",
                                      "--tmpfs",
                                      "/tmp",
                                      "--tmpfs",
                                      "/proc/driver"};
    add(&words, {"--bind", m_directory, "/tmp/handset"});
    add(&words,
        {"--ro-bind", TEST_LIBRARY_DIRECTORY, "/tmp/lib", "--ro-bind", TEST_PROGRAM_DIRECTORY, "/tmp/bin"});
    const char *const node_a[][2] = {{"fb0", "/dev/graphics/fb0"},
                                     {"video0", "/dev/video0"},
                                     {"tty0", "/dev/tty0"},
                                     {"sarvo_battery", "/proc/driver/sarvo_battery"}};
    for (const auto &node : node_a) {
        if (exists(node[0])) {
            add(&words, {"--bind", path(node[0]), node[1]});
        }
    }
    for (const auto &variable : g_variable_a) {
        add(&words, {"--setenv", variable[0], std::string("/tmp/handset/") + variable[1]});
    }
    add(&words, {"/bin/sh", "-c", script});
    result_st result = {};
    result.m_status = run(words, &result.m_output);
    return result;
}

bool stand_in_test::has_sandbox()
{
    std::string output;
    return run({"bwrap", "--unshare-user", "--unshare-pid", "--ro-bind", "/", "/", "--proc", "/proc", "true"},
               &output) == 0;
}
