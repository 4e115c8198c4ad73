#include "amt/amt-handle/request/result-file.h"

#include <errno.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/file/file.h"
#include "pub/log/print.h"

namespace {

constexpr const char *FOLDER = "/amt";
constexpr int32_t COUNT_MAX = 36;
constexpr int32_t VERDICT_PASS = 1;
constexpr int32_t VERDICT_FAIL = 2;

/* Logs a failure of a call on a path, whose errno stands. */
void log_failure(const char *call, const char *path)
{
    PUB_LOG(g_amt_handle_log, "%s(%s) failure. errorr: %d - %s", call, path, errno, strerror(errno));
}

int fail_access(const char *call, const char *path, const pub_log_place_st &place = g_amt_handle_log)
{
    pub_log_error(place, AMT_RESULT_FILE_ERR_ACCESS);
    log_failure(call, path);
    return AMT_RESULT_FILE_ERR_ACCESS;
}

/*
 * Whether no file has the path. Of one that only cannot be looked at just now nothing is known: to make it anew would
 * lose what it holds.
 */
bool is_missing(const char *path)
{
    return access(path, F_OK) != 0 && errno != EIO && errno != ENOMEM;
}

/* Seeks to an item. A negative index, before the start of any file, fails and leaves the file where it is. */
int seek_item(const pub_file_st &file, int32_t index)
{
    return fseek(file.m_stream_ptr, index < 0 ? -1L : 2L * index, SEEK_SET);
}

const char *get_digit(int32_t verdict)
{
    if (verdict == VERDICT_PASS) {
        return "1";
    }
    pub_print("[TEST_RESULT] update item for %s", verdict == VERDICT_FAIL ? "TEST_FAIL" : "TEST_UNKNOWN");
    return verdict == VERDICT_FAIL ? "2" : "0";
}

int check_index(int32_t index, int32_t count, const pub_log_place_st &place = g_amt_handle_log)
{
    if (index < count) {
        return PUB_ERR_NONE;
    }
    return pub_log_fail(place, AMT_RESULT_FILE_ERR_ITEM, "item index error: %d\n", index);
}

/* Stores a verdict for the operation that calls this. */
int save_result(const char *path, int32_t count, int32_t index, int32_t verdict,
                const char *func = __builtin_FUNCTION())
{
    pub_log_entry(g_amt_handle_log, func);
    if (check_index(index, count, {g_amt_handle_log, func}) != PUB_ERR_NONE) {
        return AMT_RESULT_FILE_ERR_ITEM;
    }
    if (access(FOLDER, R_OK | W_OK) != 0) {
        return pub_log_fail({g_amt_handle_log, func}, AMT_RESULT_FILE_ERR_ACCESS,
                            "Save fail: Directory access deny\n");
    }
    if (is_missing(path) && initTestFile(path, count) != PUB_ERR_NONE) {
        return pub_log_fail({g_amt_handle_log, func}, AMT_RESULT_FILE_ERR_WRITE,
                            "Save fail: init result file error\n");
    }
    if (updateTestItem(path, index, verdict) != PUB_ERR_NONE) {
        return pub_log_fail({g_amt_handle_log, func}, AMT_RESULT_FILE_ERR_ITEM,
                            "Save fail: update result error\n");
    }
    return PUB_ERR_NONE;
}

} // namespace

int initTestFile(const char *path, int32_t count)
{
    pub_log_entry(g_amt_handle_log);
    if (count > COUNT_MAX) {
        return pub_log_fail(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS, "test item error: %d\n", count);
    }
    PUB_LOG(g_amt_handle_log, "initTestFile . path:%s; count: %d\n", path, count);
    const pub_file_st file(path, pub_file_mode_en::WRITE);
    if (!file.is_open()) {
        return fail_access("open file", path);
    }
    for (int32_t i = 0; i < count; i++) {
        fputs("0\n", file.m_stream_ptr);
    }
    if (fflush(file.m_stream_ptr) != 0 || ferror(file.m_stream_ptr) != 0) {
        const int status = pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_WRITE);
        /* A part of a file would be taken for a whole one from then on. */
        unlink(path);
        return status;
    }
    return PUB_ERR_NONE;
}

int updateTestItem(const char *path, int32_t index, int32_t verdict)
{
    pub_log_entry(g_amt_handle_log);
    const pub_file_st file(path, pub_file_mode_en::UPDATE);
    if (!file.is_open()) {
        return fail_access("open file", path);
    }
    seek_item(file, index);
    const char *const digit = get_digit(verdict);
    if (!pub_file_put(file, digit)) {
        return pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_WRITE);
    }
    PUB_LOG(g_amt_handle_log, "write item [%d], result= %s\n", index, digit);
    return PUB_ERR_NONE;
}

int saveAmtResult(int32_t index, int32_t verdict)
{
    return save_result(AMT_RESULT_FILE, AMT_RESULT_COUNT, index, verdict);
}

int saveProductResult(int32_t index, int32_t verdict)
{
    return save_result(AMT_PRODUCT_FILE, AMT_PRODUCT_COUNT, index, verdict);
}

int readProductResult(int32_t index)
{
    pub_log_entry(g_amt_handle_log);
    if (check_index(index, AMT_PRODUCT_COUNT) != PUB_ERR_NONE) {
        return AMT_RESULT_FILE_ERR_ITEM;
    }
    if (access(FOLDER, R_OK) != 0) {
        return fail_access("access folder", FOLDER);
    }
    if (is_missing(AMT_PRODUCT_FILE)) {
        log_failure("access file", AMT_PRODUCT_FILE);
        if (initTestFile(AMT_PRODUCT_FILE, AMT_PRODUCT_COUNT) != PUB_ERR_NONE) {
            return pub_log_fail(g_amt_handle_log, AMT_RESULT_FILE_ERR_WRITE,
                                "initTestFile fail: init result file error\n");
        }
    }
    const pub_file_st file(AMT_PRODUCT_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return fail_access("open file", AMT_PRODUCT_FILE);
    }
    if (seek_item(file, index) != 0) {
        return pub_log_fail(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS,
                            "call fseek failure. errorr: %d - %s", errno, strerror(errno));
    }
    char text_a[2] = {};
    if (pub_file_get_line(file, text_a, sizeof(text_a)) > 0) {
        PUB_LOG(g_amt_handle_log, "itemIndex = %d, buf= %s\n", index, text_a);
        return atoi(text_a);
    }
    if (ferror(file.m_stream_ptr) != 0) {
        return pub_log_fail(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS, "call fgets error. errorr: %d - %s",
                            errno, strerror(errno));
    }
    return 0;
}
