#include "amt/amt-handle/request/nvram-file.h"

#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include "amt/amt-handle/request/factory-file.h"
#include "amt/amt-handle/request/line-file.h"
#include "amt/amt-log.h"
#include "pub/error.h"

static constexpr const char *STOCK_FILE = "/system/etc/wifi/nvram.txt";
static constexpr const char *STOCK_FILE_2 = "/system/etc/wifi/bcmdhd.cal";
static constexpr const char *DRIVER_FILE = "/data/misc/wifi/nvram.txt";
static constexpr mode_t DRIVER_FILE_MODE = 0666;

static constexpr char ADDRESS_KEY[] = "macaddr=";
static constexpr size_t ADDRESS_KEY_LENGTH = sizeof(ADDRESS_KEY) - 1;
static constexpr uint32_t ADDRESS_SIZE = 60;

/* A copy that has more ordinary lines than this is taken for a broken stock file. */
static constexpr uint32_t LINE_COUNT_MAX = 99;

/* The text behind the address key of a line that sets the address; null for any other line. */
static const char *find_old_address(const char *line_ptr)
{
    const char *const text_ptr = line_ptr + strspn(line_ptr, " ");
    return strncmp(text_ptr, ADDRESS_KEY, ADDRESS_KEY_LENGTH) == 0 ? text_ptr + ADDRESS_KEY_LENGTH : nullptr;
}

static void put_address(FILE *destination, const char *address)
{
    fputs(ADDRESS_KEY, destination);
    fputs(address, destination);
}

int amt_nvram_copy(FILE *source, FILE *destination, const char *address)
{
    const bool is_known = address[0] != '\0';
    bool is_replaced = false;
    uint32_t line_count = 0;
    char line_a[AMT_LINE_SIZE];
    for (uint32_t length = 0; line_count <= LINE_COUNT_MAX && (length = amt_line_get(source, line_a)) > 0;) {
        const char *const old_ptr = is_known ? find_old_address(line_a) : nullptr;
        if (old_ptr == nullptr) {
            fwrite(line_a, 1, length, destination);
            line_count++;
            continue;
        }
        PUB_LOG(g_amt_handle_log, "wifi_addr_nvram: %.*s", static_cast<int>(ADDRESS_SIZE - 1), old_ptr);
        put_address(destination, address);
        is_replaced = true;
    }
    if (is_known && !is_replaced) {
        put_address(destination, address);
        PUB_LOG(g_amt_handle_log, "new wifi_addr_nvram: %s", address);
    }
    return line_count > LINE_COUNT_MAX ? PUB_ERR_FAIL : PUB_ERR_NONE;
}

/* Every failure here is one of amt_write_wifi_to_nvram_file, and is logged under its name. */
static void log_failure(int line, const char *action, const char *path)
{
    pub_log_error(g_amt_handle_log, PUB_ERR_FAIL, "amt_write_wifi_to_nvram_file", line);
    PUB_LOG(g_amt_handle_log, "%s  %s fail", action, path);
}

/* address_ptr (ADDRESS_SIZE bytes) is left empty without a stored address. A missing file is no failure of
 * the rewrite. */
static int read_stored_address(char *address_ptr)
{
    char line_a[AMT_LINE_SIZE];
    const amt_line_step_en step = amt_line_file_read(AMT_WIFI_ADDRESS_FILE, line_a);
    amt_line_copy(address_ptr, ADDRESS_SIZE, line_a);
    switch (step) {
    case amt_line_step_en::OPEN_FAILED:
        log_failure(__LINE__, "open", AMT_WIFI_ADDRESS_FILE);
        return PUB_ERR_NONE;
    case amt_line_step_en::READ_FAILED:
        log_failure(__LINE__, "read", AMT_WIFI_ADDRESS_FILE);
        return PUB_ERR_FAIL;
    case amt_line_step_en::DONE:
        break;
    }
    PUB_LOG(g_amt_handle_log, "wifi_addr_amt: %s", address_ptr);
    return PUB_ERR_NONE;
}

static FILE *open_second_stock_file()
{
    PUB_LOG(g_amt_handle_log, "File \"%s\" not exist, so we try to open file \"%s\"", STOCK_FILE,
            STOCK_FILE_2);
    FILE *const source = fopen(STOCK_FILE_2, "r");
    if (source == nullptr) {
        log_failure(__LINE__, "open", STOCK_FILE_2);
    }
    return source;
}

static int copy_and_check(FILE *source, FILE *destination, const char *address)
{
    const int ret_val = amt_nvram_copy(source, destination, address);
    if (fflush(destination) == 0 && ferror(destination) == 0) {
        return ret_val;
    }
    pub_log_error(g_amt_handle_log, PUB_ERR_FAIL, "amt_write_wifi_to_nvram_file");
    pub_log_sys_call(g_amt_handle_log, "fputs");
    return PUB_ERR_FAIL;
}

/*
 * Opens both files or none. The driver's file is opened, and so emptied, before it is known whether there is
 * a stock file: rather no calibration than one that may carry another handset's address.
 */
static int open_files(FILE **source_ptr, FILE **destination_ptr)
{
    FILE *source = fopen(STOCK_FILE, "r");
    FILE *const destination = fopen(DRIVER_FILE, "w+");
    const int destination_errno = errno;
    if (source == nullptr) {
        source = open_second_stock_file();
    }
    if (source != nullptr && destination != nullptr) {
        *source_ptr = source;
        *destination_ptr = destination;
        return PUB_ERR_NONE;
    }
    if (source != nullptr) {
        errno = destination_errno;
        log_failure(__LINE__, "open", DRIVER_FILE);
        fclose(source);
    }
    if (destination != nullptr) {
        fclose(destination);
    }
    return PUB_ERR_FAIL;
}

/* The driver runs as another user. */
static void open_driver_file_to_all()
{
    FILE *const stream = fopen(DRIVER_FILE, "r");
    if (stream == nullptr) {
        PUB_LOG(g_amt_handle_log, "open %s failed", DRIVER_FILE);
        return;
    }
    if (fchmod(fileno(stream), DRIVER_FILE_MODE) == 0) {
        PUB_LOG(g_amt_handle_log, "fchmod  %s successfully", DRIVER_FILE);
    } else {
        PUB_LOG(g_amt_handle_log, "fchmod  %s failed, %s", DRIVER_FILE, strerror(errno));
    }
    fclose(stream);
}

int amt_write_wifi_to_nvram_file()
{
    pub_log_entry(g_amt_handle_log);
    char address_a[ADDRESS_SIZE];
    const int address_ret = read_stored_address(address_a);
    FILE *source = nullptr;
    FILE *destination = nullptr;
    if (open_files(&source, &destination) != PUB_ERR_NONE) {
        return PUB_ERR_FAIL;
    }
    const int copy_ret = copy_and_check(source, destination, address_a);
    fclose(source);
    fclose(destination);
    amt_factory_file_sync();
    open_driver_file_to_all();
    return address_ret != PUB_ERR_NONE ? address_ret : copy_ret;
}
