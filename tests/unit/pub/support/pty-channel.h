#pragma once

#include <fcntl.h>
#include <filesystem>
#include <stdlib.h>
#include <string.h>
#include <string>
#include <system_error>
#include <unistd.h>

#include <gtest/gtest.h>

#include "pub/pty/pty.h"
#include "tests/unit/pub/support/lines.h"

/* The error line of a function of this source. */
inline std::string pty_error(const std::string &func, int error_code, int error_number)
{
    return error_line("pty/pty", func, error_code, error_number);
}

inline bool is_link(const std::string &path)
{
    return std::filesystem::is_symlink(std::filesystem::symlink_status(path));
}

inline bool is_open(int fd)
{
    return fcntl(fd, F_GETFD) >= 0;
}

/* What stands in the brackets at the end of a log text. */
inline std::string in_brackets(const std::string &text)
{
    const size_t begin = text.find('[') + 1;
    return text.substr(begin, text.size() - 1 - begin);
}

/* How many descriptors this process has. */
inline int open_descriptors()
{
    int count = 0;
    for ([[maybe_unused]] const std::filesystem::directory_entry &entry :
         std::filesystem::directory_iterator("/proc/self/fd"))
    {
        count++;
    }
    return count;
}

/* A channel with a mapping name in a directory of its own. */
class pty : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_NE(mkdtemp(m_folder.data()), nullptr);
        use_mapping(path("app"));
    }
    void TearDown() override
    {
        std::error_code ignored;
        std::filesystem::remove_all(m_folder, ignored);
        if (m_pty.m_ptm_fd > 0) {
            close(m_pty.m_ptm_fd);
        }
    }
    void use_mapping(const std::string &mapping)
    {
        m_mapping = mapping;
        ASSERT_LT(mapping.size(), sizeof(m_pty.m_pts_mapping_name_a));
        memset(m_pty.m_pts_mapping_name_a, 0, sizeof(m_pty.m_pts_mapping_name_a));
        memcpy(m_pty.m_pts_mapping_name_a, mapping.data(), mapping.size());
    }
    std::string path(const std::string &name) const
    {
        return m_folder + "/" + name;
    }
    std::string fd() const
    {
        return std::to_string(m_pty.m_ptm_fd);
    }
    std::string slave() const
    {
        return m_pty.m_pts_name_a;
    }

    /* The log of an open from its entry to the link; the mapping path held something before, or nothing. */
    lines_t begin_lines(const std::string &old_fd, bool is_replaced) const
    {
        lines_t text_list = {
            "pub_pty_open m_ptm_fd[" + old_fd + "]",
            "pub_pty_open m_ptm_fd[" + fd() + "]",
            "create_pts_mapping pts_name_ptr[" + slave() + "]",
            "create_pts_mapping m_pts_name_a[" + slave() + "] ret_val[0]",
            "create_pts_mapping unlink(" + m_mapping + ") ret_val[" + (is_replaced ? "0" : "-1") + "]",
        };
        if (is_replaced) {
            text_list.push_back("create_pts_mapping \"" + m_mapping + "\" not exists");
        }
        text_list.push_back("create_pts_mapping symlink(" + slave() + ", " + m_mapping + ") ret_val[0]");
        return text_list;
    }
    /* The rest of the log of an open that succeeds. */
    lines_t end_lines() const
    {
        return {
            "create_pts_mapping chmod(" + m_mapping + ", 432) ret_val[0]",
            "create_pts_mapping chown(" + m_mapping + ", 1000, 1001) ret_val[0]",
            "create_pts_mapping m_pts_mapping_name_a[" + m_mapping + "] ret_val[0]",
            "set_ptm_attr fd[" + fd() + "]",
            "set_ptm_attr tcgetattr(" + fd() + ") ret_val[0]",
            "set_ptm_attr tcsetattr(" + fd() + ") ret_val[0]",
            "set_ptm_attr grantpt(" + fd() + ") ret_val[0]",
            "set_ptm_attr unlockpt(" + fd() + ") ret_val[0]",
            "set_ptm_attr fd[" + fd() + "] ret_val[0]",
            "pub_pty_open \"" + m_mapping + "\" exists",
            "pub_pty_open m_ptm_fd[" + fd() + "]; m_pts_name_a[" + slave() + "] m_pts_mapping_name_a[" +
                m_mapping + "]",
        };
    }
    lines_t delete_lines() const
    {
        return {"pub_pty_delete_mapping unlink(" + m_mapping + ") ret_val[0]"};
    }
    lines_t vanished_lines() const
    {
        return {"WARNING !", "pub_pty_delete_mapping \"" + m_mapping + "\" does not exist"};
    }

    std::string m_folder = "/tmp/vxXXXXXX"; /* short: a mapping name has 27 characters */
    std::string m_mapping;
    pub_pty_st m_pty = {};
};

inline const lines_t CLOSE_LINE = {"pub_pty_close pub_pty_delete_mapping ret_val[0]"};
