#include "pub/util/util.h"

#include <errno.h>
#include <sched.h>
#include <string>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/statfs.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "pub/error.h"
#include "pub/log/log.h"
#include "tests/unit/pub/support/child-process.h"
#include "tests/unit/pub/support/lines.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

namespace {

const std::string FUNC = "pub_util_get_mount_fs_info";
constexpr int NOT_POSSIBLE = 77;

std::string util_error(int error_code, int error_number)
{
    return error_line("util/util", FUNC, error_code, error_number);
}

std::string figures(const std::string &mount_point)
{
    uint32_t total = 1;
    uint32_t used = 1;
    uint32_t available = 1;
    const int status = pub_util_get_mount_fs_info(mount_point.c_str(), &total, &used, &available);
    return std::to_string(status) + ": " + std::to_string(total) + " " + std::to_string(used) + " " +
           std::to_string(available);
}

/* What figures says of an empty file system in memory of the given size, mounted there in a child's own view.
 */
std::string figures_of_new_mount(const std::string &mount_point, const std::string &size)
{
    const child_run_st run = run_in_child([&] {
        mkdir(mount_point.c_str(), 0700);
        if (unshare(CLONE_NEWNS) != 0 && unshare(CLONE_NEWUSER | CLONE_NEWNS) != 0) {
            return NOT_POSSIBLE;
        }
        const std::string options = "size=" + size;
        if (mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            mount("none", mount_point.c_str(), "tmpfs", 0, options.c_str()) != 0)
        {
            return NOT_POSSIBLE;
        }
        const std::string result = figures(mount_point);
        PUB_LOG((pub_log_source_st{"", ""}), "%s", result.c_str());
        return 0;
    });
    return run.m_is_complete && run.m_result == 0 ? run.m_text_list.back() : "";
}

} // namespace

TEST(mount_info, figures_of_a_mounted_file_system)
{
    struct statfs64 info = {};
    ASSERT_EQ(statfs64("/", &info), 0);
    uint32_t total = 0;
    uint32_t used = 0;
    uint32_t available = 0;
    const log_capture_c capture;
    EXPECT_EQ(pub_util_get_mount_fs_info("/", &total, &used, &available), PUB_ERR_NONE);
    const uint64_t block_size = static_cast<uint64_t>(info.f_bsize);
    EXPECT_EQ(total, static_cast<uint32_t>(block_size * info.f_blocks / 1024));
    EXPECT_EQ(used + available, total);
    EXPECT_THAT(capture.texts(), testing::ElementsAre(FUNC + "()"));
}

TEST(mount_info, absent_outputs_are_left_out)
{
    uint32_t total = 0;
    uint32_t again = 0;
    ASSERT_EQ(pub_util_get_mount_fs_info("/", &total, nullptr, nullptr), PUB_ERR_NONE);
    uint32_t used = 0;
    uint32_t available = 0;
    EXPECT_EQ(pub_util_get_mount_fs_info("/", nullptr, &used, &available), PUB_ERR_NONE);
    EXPECT_EQ(used + available, total);
    EXPECT_EQ(pub_util_get_mount_fs_info("/", &again, nullptr, &available), PUB_ERR_NONE);
    EXPECT_EQ(again, total);
}

TEST(mount_info, known_size)
{
    const temp_folder_c dir;
    const std::string text = figures_of_new_mount(dir.path("m"), "64m");
    if (text.empty()) {
        GTEST_SKIP() << "nothing can be mounted here";
    }
    EXPECT_EQ(text, "0: 65536 0 65536");
}

TEST(mount_info, figures_are_cut_to_32_bits)
{
    const temp_folder_c dir;
    const std::string text = figures_of_new_mount(dir.path("m"), "5t");
    if (text.empty()) {
        GTEST_SKIP() << "nothing can be mounted here";
    }
    EXPECT_EQ(text, "0: 1073741824 0 1073741824"); /* 5 * 2^30 KiB less 2^32 */
}

TEST(mount_info, lines_are_searched_up_to_200_bytes)
{
    const temp_folder_c dir;
    /* A line reads "none /tmp/vxXXXXXX/m... tmpfs ...". */
    const size_t room = 200 - std::string("none " + dir.path("")).size();
    const std::string fitting = figures_of_new_mount(dir.path(std::string(room, 'm')), "64m");
    const std::string cut = figures_of_new_mount(dir.path(std::string(room + 1, 'n')), "64m");
    if (fitting.empty() || cut.empty()) {
        GTEST_SKIP() << "nothing can be mounted here";
    }
    EXPECT_EQ(fitting, "0: 65536 0 65536");
    EXPECT_EQ(cut, "-104: 1 1 1");
}

TEST(mount_info, not_mounted)
{
    uint32_t total = 77;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_get_mount_fs_info("/no/such/mount", &total, nullptr, nullptr), PUB_ERR_NOT_FOUND);
    EXPECT_EQ(total, 77U);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(FUNC + "()", util_error(-104, 0),
                                     "file system \"/no/such/mount\" has not been mounted"));
}

TEST(mount_info, any_part_of_a_line_counts_as_mounted)
{
    uint32_t total = 77;
    const log_capture_c capture;
    EXPECT_EQ(pub_util_get_mount_fs_info("/proc proc", &total, nullptr, nullptr), PUB_ERR_FILE);
    EXPECT_EQ(total, 77U);
    EXPECT_THAT(without_line_numbers(capture),
                testing::ElementsAre(FUNC + "()", sys_call_line("statfs", ENOENT), util_error(-1, ENOENT)));
}

TEST(mount_info, list_of_mounts_that_cannot_be_opened)
{
    const child_run_st run = run_in_child([] {
        const rlimit none = {0, 0};
        setrlimit(RLIMIT_NOFILE, &none);
        uint32_t total = 0;
        return pub_util_get_mount_fs_info("/", &total, nullptr, nullptr);
    });
    EXPECT_EQ(run.m_result, PUB_ERR_NOT_FOUND);
    EXPECT_THAT(run.m_text_list,
                testing::ElementsAre(FUNC + "()", sys_call_line("fopen", EMFILE), util_error(-1, EMFILE),
                                     util_error(-104, EMFILE), "file system \"/\" has not been mounted"));
}

TEST(mount_info, absent_and_empty_arguments)
{
    uint32_t total = 77;
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(pub_util_get_mount_fs_info(nullptr, &total, &total, &total), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_mount_fs_info("", &total, &total, &total), PUB_ERR_PARAM);
    EXPECT_EQ(pub_util_get_mount_fs_info("/", nullptr, nullptr, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(total, 77U);
    lines_t expected_list;
    for (const char *flags : {"1, 0, 0", "0, 1, 0", "0, 0, 1"}) {
        expected_list.insert(expected_list.end(), {FUNC + "()", util_error(-101, 0), flags});
    }
    EXPECT_EQ(without_line_numbers(capture), expected_list);
}
