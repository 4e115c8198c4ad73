#include "amt/amt-handle/request/nvram-file.h"

#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr const char *STOCK_FILE = "/system/etc/wifi/nvram.txt";
constexpr const char *STOCK_FILE_2 = "/system/etc/wifi/bcmdhd.cal";
constexpr const char *DRIVER_FILE = "/data/misc/wifi/nvram.txt";
constexpr mode_t DRIVER_FILE_MODE = 0666;

constexpr char ADDRESS_KEY[] = "macaddr=";
constexpr size_t ADDRESS_KEY_LENGTH = sizeof(ADDRESS_KEY) - 1;
constexpr uint32_t ADDRESS_SIZE = 60;

/* Room for a line of 98 characters. */
constexpr uint32_t LINE_SIZE = 99;

/* A copy that has more ordinary lines than this is taken for a broken stock file. */
constexpr uint32_t LINE_COUNT_MAX = 99;

/* Every failure here is one of this operation, and is logged under its name. */
constexpr char OPERATION[] = "amt_write_wifi_to_nvram_file";

int fail_on(const char *action, const char *path,
            const pub_log_place_st &place = {g_amt_handle_log, OPERATION})
{
    return pub_log_fail(place, PUB_ERR_FAIL, "%s  %s fail", action, path);
}

/* The text behind the address key of a line that sets the address; null for any other line. */
const char *find_old_address(const char *line_ptr)
{
    const char *const text_ptr = line_ptr + strspn(line_ptr, " ");
    return strncmp(text_ptr, ADDRESS_KEY, ADDRESS_KEY_LENGTH) == 0 ? text_ptr + ADDRESS_KEY_LENGTH : nullptr;
}

void put_address(const pub_file_st &destination, const char *address)
{
    fputs(ADDRESS_KEY, destination.m_stream_ptr);
    fputs(address, destination.m_stream_ptr);
}

/* address_ptr (ADDRESS_SIZE bytes) is left empty without a stored address. A missing file is no failure of
 * the rewrite. */
int read_stored_address(char *address_ptr)
{
    const pub_file_step_en step = pub_file_read_line(AMT_WIFI_ADDRESS_FILE, address_ptr, ADDRESS_SIZE);
    if (step == pub_file_step_en::OPEN_FAILED) {
        fail_on("open", AMT_WIFI_ADDRESS_FILE);
        return PUB_ERR_NONE;
    }
    if (step != pub_file_step_en::DONE) {
        return fail_on("read", AMT_WIFI_ADDRESS_FILE);
    }
    PUB_LOG(g_amt_handle_log, "wifi_addr_amt: %s", address_ptr);
    return PUB_ERR_NONE;
}

/* The driver runs as another user. A failure is logged and changes nothing else. */
void open_driver_file_to_all()
{
    const pub_file_st file(DRIVER_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        pub_log_fail({g_amt_handle_log, OPERATION}, PUB_ERR_FILE, "open %s failed", DRIVER_FILE);
        return;
    }
    if (fchmod(fileno(file.m_stream_ptr), DRIVER_FILE_MODE) != 0) {
        pub_log_fail({g_amt_handle_log, OPERATION}, PUB_ERR_FILE, "fchmod  %s failed, %s", DRIVER_FILE,
                     strerror(errno));
        return;
    }
    PUB_LOG(g_amt_handle_log, "fchmod  %s successfully", DRIVER_FILE);
}

} // namespace

int amt_nvram_copy(const pub_file_st &source, const pub_file_st &destination, const char *address)
{
    FILE *const out = destination.m_stream_ptr;
    const bool is_known = address[0] != '\0';
    bool is_replaced = false;
    uint32_t line_count = 0;
    char line_a[LINE_SIZE];
    for (uint32_t length = 0;
         line_count <= LINE_COUNT_MAX && (length = pub_file_get_line(source, line_a, sizeof(line_a))) > 0;)
    {
        const char *const old_ptr = is_known ? find_old_address(line_a) : nullptr;
        if (old_ptr == nullptr) {
            fwrite(line_a, 1, length, out);
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
    if (fflush(out) != 0 || ferror(out) != 0) {
        return pub_log_error_call({g_amt_handle_log, OPERATION}, PUB_ERR_FAIL, "fputs");
    }
    return line_count > LINE_COUNT_MAX ? pub_log_error({g_amt_handle_log, OPERATION}, PUB_ERR_FAIL)
                                       : PUB_ERR_NONE;
}

int amt_write_wifi_to_nvram_file()
{
    pub_log_entry(g_amt_handle_log);
    char address_a[ADDRESS_SIZE];
    const int address_status = read_stored_address(address_a);
    pub_file_st source(STOCK_FILE, pub_file_mode_en::READ);
    /* Opened, and so emptied, before it is known whether there is a stock file: rather no calibration than
     * one that may carry another handset's address. */
    pub_file_st destination(DRIVER_FILE, pub_file_mode_en::RENEW);
    const int destination_errno = errno;
    if (!source.is_open()) {
        PUB_LOG(g_amt_handle_log, "File \"%s\" not exist, so we try to open file \"%s\"", STOCK_FILE,
                STOCK_FILE_2);
        pub_file_open(&source, STOCK_FILE_2, pub_file_mode_en::READ);
    }
    if (!source.is_open()) {
        return fail_on("open", STOCK_FILE_2);
    }
    if (!destination.is_open()) {
        errno = destination_errno;
        return fail_on("open", DRIVER_FILE);
    }
    const int copy_status = amt_nvram_copy(source, destination, address_a);
    pub_file_close(&source);
    pub_file_close(&destination);
    amt_factory_file_sync();
    open_driver_file_to_all();
    return address_status != PUB_ERR_NONE ? address_status : copy_status;
}
