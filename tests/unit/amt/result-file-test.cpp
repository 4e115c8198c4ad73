#include "amt/amt-handle/request/result-file.h"

#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/unit/amt/small-file.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

/* The operations that take a path; those with the factory's own paths are tested on the running daemon. */
namespace {

std::string items(const std::string &digits)
{
    std::string text;
    for (const char digit : digits) {
        text += std::string(1, digit) + "\n";
    }
    return text;
}

class result_file : public testing::Test {
protected:
    temp_folder_c m_folder;
    const std::string m_path = m_folder.path("result.txt");
};

TEST_F(result_file, is_created_with_every_item_untested)
{
    for (const int count : {0, 1, 20, 36}) {
        const log_capture_c capture;
        EXPECT_EQ(initTestFile(m_path.c_str(), count), 0);
        EXPECT_EQ(read_whole_file(m_path), items(std::string(static_cast<size_t>(count), '0')));
        EXPECT_EQ(capture.texts(),
                  (std::vector<std::string>{"initTestFile()", "initTestFile . path:" + m_path + "; count: " +
                                                                  std::to_string(count) + "\n"}));
    }
}

TEST_F(result_file, has_at_most_36_items)
{
    const log_capture_c capture;
    EXPECT_EQ(initTestFile(m_path.c_str(), 37), -1);
    EXPECT_TRUE(capture.has("test item error: 37\n"));
    EXPECT_EQ(read_whole_file(m_path), "(missing)");
}

TEST_F(result_file, cannot_be_created_in_a_missing_folder)
{
    const std::string path = m_folder.path("missing/result.txt");
    const std::string expected = "open file(" + path + ") failure. errorr: 2 - No such file or directory";
    const log_capture_c capture;
    EXPECT_EQ(initTestFile(path.c_str(), 20), -1);
    EXPECT_EQ(capture.texts().back(), expected);
    EXPECT_EQ(updateTestItem(path.c_str(), 0, 1), -1);
    EXPECT_EQ(capture.texts().back(), expected);
}

TEST_F(result_file, is_created_whole_or_not_at_all)
{
    const small_file_c small(10);
    const log_capture_c capture;
    EXPECT_EQ(initTestFile(m_path.c_str(), 20), -2);
    EXPECT_EQ(capture.count_containing("FUNC-initTestFile(), error_code=-2"), 1);
    EXPECT_EQ(read_whole_file(m_path), "(missing)");
    EXPECT_EQ(initTestFile(m_path.c_str(), 5), 0);
    EXPECT_EQ(read_whole_file(m_path), items("00000"));
}

TEST_F(result_file, is_updated_in_place)
{
    ASSERT_EQ(initTestFile(m_path.c_str(), 4), 0);
    const log_capture_c capture;
    EXPECT_EQ(updateTestItem(m_path.c_str(), 1, 1), 0);
    EXPECT_EQ(capture.texts(), (std::vector<std::string>{"updateTestItem()", "write item [1], result= 1\n"}));
    EXPECT_EQ(updateTestItem(m_path.c_str(), 3, 2), 0);
    EXPECT_EQ(read_whole_file(m_path), items("0102"));
    EXPECT_EQ(updateTestItem(m_path.c_str(), 0, 2), 0);
    EXPECT_EQ(read_whole_file(m_path), items("2102"));
}

TEST_F(result_file, stores_any_other_verdict_as_untested)
{
    for (const int verdict : {0, 3, -1, 257, INT32_MIN}) {
        write_whole_file(m_path, items("111"));
        EXPECT_EQ(updateTestItem(m_path.c_str(), 1, verdict), 0);
        EXPECT_EQ(read_whole_file(m_path), items("101"));
    }
}

TEST_F(result_file, a_negative_index_writes_the_first_byte)
{
    for (const int index : {-1, -20, INT32_MIN, INT32_MIN + 1}) {
        write_whole_file(m_path, items("000"));
        const log_capture_c capture;
        EXPECT_EQ(updateTestItem(m_path.c_str(), index, 2), 0);
        EXPECT_EQ(read_whole_file(m_path), items("200"));
        EXPECT_EQ(capture.texts().back(), "write item [" + std::to_string(index) + "], result= 2\n");
    }
}

TEST_F(result_file, prints_what_is_no_pass)
{
    ASSERT_EQ(initTestFile(m_path.c_str(), 2), 0);
    testing::internal::CaptureStdout();
    updateTestItem(m_path.c_str(), 0, 1);
    updateTestItem(m_path.c_str(), 0, 2);
    updateTestItem(m_path.c_str(), 0, 7);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "[TEST_RESULT] update item for TEST_FAIL[TEST_RESULT] update item for TEST_UNKNOWN");
}

TEST_F(result_file, tells_when_a_digit_cannot_be_written)
{
    if (access("/dev/full", W_OK) != 0) {
        GTEST_SKIP() << "no /dev/full";
    }
    ASSERT_EQ(symlink("/dev/full", m_path.c_str()), 0);
    const log_capture_c capture;
    EXPECT_EQ(updateTestItem(m_path.c_str(), 0, 1), -2);
    EXPECT_EQ(capture.count_containing("write item"), 0);
}

TEST(result_file_index, is_refused_from_the_item_count_on)
{
    for (const int index : {20, 21, INT32_MAX}) {
        const log_capture_c capture;
        EXPECT_EQ(saveAmtResult(index, 1), -3);
        EXPECT_EQ(capture.texts().back(), "item index error: " + std::to_string(index) + "\n");
    }
    for (const int index : {36, 37, INT32_MAX}) {
        const log_capture_c capture;
        EXPECT_EQ(saveProductResult(index, 1), -3);
        EXPECT_EQ(capture.texts().back(), "item index error: " + std::to_string(index) + "\n");
        EXPECT_EQ(readProductResult(index), -3);
        EXPECT_EQ(capture.texts().back(), "item index error: " + std::to_string(index) + "\n");
    }
}

TEST(result_file_index, below_the_count_fails_at_the_missing_folder_only)
{
    if (access("/amt", F_OK) == 0) {
        GTEST_SKIP() << "/amt exists";
    }
    const log_capture_c capture;
    for (const int index : {19, 0, -1, INT32_MIN}) {
        EXPECT_EQ(saveAmtResult(index, 1), -1);
        EXPECT_EQ(capture.texts().back(), "Save fail: Directory access deny\n");
    }
    for (const int index : {35, 0, -1, INT32_MIN}) {
        EXPECT_EQ(saveProductResult(index, 1), -1);
        EXPECT_EQ(capture.texts().back(), "Save fail: Directory access deny\n");
        EXPECT_EQ(readProductResult(index), -1);
        EXPECT_EQ(capture.texts().back(),
                  "access folder(/amt) failure. errorr: 2 - No such file or directory");
    }
}

} // namespace
