#pragma once

#include <functional>
#include <gtest/gtest.h>
#include <string>
#include <sys/types.h>
#include <vector>

/*
 * A directory of its own for each test, with the environment of the stand-ins pointing into it: log.txt,
 * properties/, calls.txt, answers/ and devices/. Removed with everything in it at the end.
 */
class stand_in_test : public testing::Test {
protected:
    stand_in_test();
    ~stand_in_test() override;

    std::string path(const std::string &name) const;
    void write(const std::string &name, const std::string &text) const;
    std::string read(const std::string &name) const;
    bool exists(const std::string &name) const;
    std::vector<std::string> lines(const std::string &name) const;

    /* What the stand-ins recorded. */
    std::vector<std::string> calls() const;

    /* Runs work in a child process; its exit status (0 when work returned), or 128 + the signal that ended
     * it. */
    static int in_child(const std::function<void()> &work);

    struct result_st
    {
        int m_status;
        std::string m_output;
    };

    /*
     * Runs a shell script in a sandbox with a private /tmp, /dev and process namespace: this directory is
     * /tmp/handset, the libraries are in /tmp/lib and the programs in /tmp/bin. The files fb0, video0, tty0
     * and sarvo_battery of this directory, as far as they exist, lie under the names of the device nodes.
     */
    result_st run_in_handset(const std::string &script) const;

    /* False where the system allows no sandbox. */
    static bool has_sandbox();

private:
    std::string m_directory;
};

std::vector<std::string> split_lines(const std::string &text);
