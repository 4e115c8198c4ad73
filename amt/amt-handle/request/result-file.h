#pragma once

#include <stdint.h>

/*
 * The files of test verdicts: an item is one digit and one line feed, at byte 2 x index. The digits: 0 not
 * tested, 1 pass, 2 fail. An index is refused at or above the file's item count only: a negative one writes
 * the first byte (its seek fails) and cannot be read. All operations log their failures.
 */

/* The stations' verdicts that pass through the daemon. */
constexpr const char *AMT_RESULT_FILE = "/amt/amt_result.txt";
constexpr int32_t AMT_RESULT_COUNT = 20;

/* The verdicts of the on-device items. */
constexpr const char *AMT_PRODUCT_FILE = "/amt/product.txt";
constexpr int32_t AMT_PRODUCT_COUNT = 36;

/* Statuses of these operations. */
constexpr int AMT_RESULT_FILE_ERR_ACCESS = -1; /* open, access, seek or read */
constexpr int AMT_RESULT_FILE_ERR_WRITE = -2;  /* digit not written, or file not created */
constexpr int AMT_RESULT_FILE_ERR_ITEM = -3;   /* index out of range, or update failed */

/*
 * Creates or truncates the file, with count (at most 36) items of "0". Returns 0, -1, or -2 when it could not be
 * written whole: then there is no file.
 */
int initTestFile(const char *path, int32_t count);

/* Overwrites one item in place: 1 pass, 2 fail, any other verdict becomes "0". Returns 0, -1 or -2. */
int updateTestItem(const char *path, int32_t index, int32_t verdict);

/* Stores a verdict in AMT_RESULT_FILE, creating it when it is missing. Returns 0, -1, -2 or -3. */
int saveAmtResult(int32_t index, int32_t verdict);

/* As saveAmtResult, for AMT_PRODUCT_FILE. */
int saveProductResult(int32_t index, int32_t verdict);

/*
 * The digit of one item of AMT_PRODUCT_FILE, which is created when it is missing; 0 at the end of the file.
 * Returns a digit, or -1, -2 or -3.
 */
int readProductResult(int32_t index);
