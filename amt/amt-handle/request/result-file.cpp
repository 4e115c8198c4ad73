#include "amt/amt-handle/request/result-file.h"

#include <errno.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-log.h"
#include "pub/error.h"
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

FILE *open_file(const char *func, const char *path, const char *mode)
{
    FILE *const stream = fopen(path, mode);
    if (stream == nullptr) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS, func);
        log_failure("open file", path);
    }
    return stream;
}

/* Seeks to an item. A negative index, before the start of any file, fails and leaves the stream where it is.
 */
int seek_item(FILE *stream, int32_t index)
{
    return fseek(stream, index < 0 ? -1L : 2L * index, SEEK_SET);
}

char get_digit(int32_t verdict)
{
    if (verdict == VERDICT_PASS) {
        return '1';
    }
    pub_print("[TEST_RESULT] update item for %s", verdict == VERDICT_FAIL ? "TEST_FAIL" : "TEST_UNKNOWN");
    return verdict == VERDICT_FAIL ? '2' : '0';
}

int check_index(const char *func, int32_t index, int32_t count)
{
    if (index < count) {
        return PUB_ERR_NONE;
    }
    pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ITEM, func);
    PUB_LOG(g_amt_handle_log, "item index error: %d\n", index);
    return AMT_RESULT_FILE_ERR_ITEM;
}

int save_result(const char *func, const char *path, int32_t count, int32_t index, int32_t verdict)
{
    if (check_index(func, index, count) != PUB_ERR_NONE) {
        return AMT_RESULT_FILE_ERR_ITEM;
    }
    if (access(FOLDER, R_OK | W_OK) != 0) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS, func);
        PUB_LOG(g_amt_handle_log, "Save fail: Directory access deny\n");
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    if (access(path, F_OK) != 0 && initTestFile(path, count) != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_WRITE, func);
        PUB_LOG(g_amt_handle_log, "Save fail: init result file error\n");
        return AMT_RESULT_FILE_ERR_WRITE;
    }
    if (updateTestItem(path, index, verdict) != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ITEM, func);
        PUB_LOG(g_amt_handle_log, "Save fail: update result error\n");
        return AMT_RESULT_FILE_ERR_ITEM;
    }
    return PUB_ERR_NONE;
}

/* The digit at an item of an open file; 0 at its end. Returns a digit or -1. */
int read_item(FILE *stream, int32_t index)
{
    if (seek_item(stream, index) != 0) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS, "readProductResult");
        PUB_LOG(g_amt_handle_log, "call fseek failure. errorr: %d - %s", errno, strerror(errno));
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    char text_a[2] = {};
    if (fgets(text_a, sizeof(text_a), stream) != nullptr) {
        PUB_LOG(g_amt_handle_log, "itemIndex = %d, buf= %s\n", index, text_a);
        return atoi(text_a);
    }
    if (ferror(stream) != 0) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS, "readProductResult");
        PUB_LOG(g_amt_handle_log, "call fgets error. errorr: %d - %s", errno, strerror(errno));
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    return 0;
}

} // namespace

int initTestFile(const char *path, int32_t count)
{
    pub_log_entry(g_amt_handle_log);
    if (count > COUNT_MAX) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS);
        PUB_LOG(g_amt_handle_log, "test item error: %d\n", count);
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    PUB_LOG(g_amt_handle_log, "initTestFile . path:%s; count: %d\n", path, count);
    FILE *const stream = open_file(__func__, path, "w");
    if (stream == nullptr) {
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    for (int32_t i = 0; i < count; i++) {
        fputs("0\n", stream);
    }
    fclose(stream);
    return PUB_ERR_NONE;
}

int updateTestItem(const char *path, int32_t index, int32_t verdict)
{
    pub_log_entry(g_amt_handle_log);
    FILE *const stream = open_file(__func__, path, "r+");
    if (stream == nullptr) {
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    seek_item(stream, index);
    const char digit = get_digit(verdict);
    /* Flushed here: behind the C library's buffer a failed write would go unseen. */
    const bool is_written = fputc(digit, stream) != EOF && fflush(stream) == 0;
    if (is_written) {
        PUB_LOG(g_amt_handle_log, "write item [%d], result= %c\n", index, digit);
    } else {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_WRITE);
    }
    fclose(stream);
    return is_written ? PUB_ERR_NONE : AMT_RESULT_FILE_ERR_WRITE;
}

int saveAmtResult(int32_t index, int32_t verdict)
{
    pub_log_entry(g_amt_handle_log);
    return save_result(__func__, AMT_RESULT_FILE, AMT_RESULT_COUNT, index, verdict);
}

int saveProductResult(int32_t index, int32_t verdict)
{
    pub_log_entry(g_amt_handle_log);
    return save_result(__func__, AMT_PRODUCT_FILE, AMT_PRODUCT_COUNT, index, verdict);
}

int readProductResult(int32_t index)
{
    pub_log_entry(g_amt_handle_log);
    if (check_index(__func__, index, AMT_PRODUCT_COUNT) != PUB_ERR_NONE) {
        return AMT_RESULT_FILE_ERR_ITEM;
    }
    if (access(FOLDER, R_OK) != 0) {
        pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_ACCESS);
        log_failure("access folder", FOLDER);
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    if (access(AMT_PRODUCT_FILE, F_OK) != 0) {
        log_failure("access file", AMT_PRODUCT_FILE);
        if (initTestFile(AMT_PRODUCT_FILE, AMT_PRODUCT_COUNT) != PUB_ERR_NONE) {
            pub_log_error(g_amt_handle_log, AMT_RESULT_FILE_ERR_WRITE);
            PUB_LOG(g_amt_handle_log, "initTestFile fail: init result file error\n");
            return AMT_RESULT_FILE_ERR_WRITE;
        }
    }
    FILE *const stream = open_file(__func__, AMT_PRODUCT_FILE, "r");
    if (stream == nullptr) {
        return AMT_RESULT_FILE_ERR_ACCESS;
    }
    const int digit = read_item(stream, index);
    fclose(stream);
    return digit;
}
