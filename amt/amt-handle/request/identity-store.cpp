#include "amt/amt-handle/request/identity-store.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/file/file.h"
#include "pub/util/process.h"

namespace {

/* A handset whose system was reflashed from an older layout has its Bluetooth address here. */
constexpr const char *BT_ADDRESS_FILE_2 = "/mnt/opl/nvm/BT_Address.txt";

/* Room for the longest line that counts, 98 characters with the line feed. */
constexpr uint32_t LINE_SIZE = 99;

constexpr mode_t FOLDER_MODE = 0777;
constexpr uint32_t FOLDER_COMMAND_SIZE = 100;

/* Reads the first line of the file, cut to what fits buf (size bytes), for the operation of that name. */
int read_first_line(const char *path, char *buf, uint32_t size,
                    const pub_log_place_st &place = g_amt_handle_log)
{
    memset(buf, 0, size);
    char line_a[LINE_SIZE];
    const pub_file_step_en step = pub_file_read_line(path, line_a, sizeof(line_a));
    if (step == pub_file_step_en::OPEN_FAILED) {
        return amt_factory_file_fail_open(path, place);
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail(place, PUB_ERR_FILE, "read fail: %d - %s", errno, strerror(errno));
    }
    memcpy(buf, line_a, strnlen(line_a, size - 1));
    return PUB_ERR_NONE;
}

/* verb is a constant of this file; only the path is cut when both do not fit. */
void run_on_folder(const char *verb, const char *path)
{
    char command_a[FOLDER_COMMAND_SIZE];
    snprintf(command_a, sizeof(command_a), "%s %s", verb, path);
    pub_util_run_shell(command_a);
}

} // namespace

int amt_write_pcba_sn(const char *text, const char *path)
{
    pub_log_entry(g_amt_handle_log);
    if (text == nullptr || text[0] == '\0') {
        return pub_log_bad_param(g_amt_handle_log, {text == nullptr, text != nullptr});
    }
    if (const int status = amt_factory_file_store(path, text); status != PUB_ERR_NONE) {
        return status;
    }
    PUB_LOG(g_amt_handle_log, "write pcba-sn: %s", text);
    return PUB_ERR_NONE;
}

int amt_read_pcba_sn(char *buf)
{
    pub_log_entry(g_amt_handle_log);
    if (const int status = read_first_line(AMT_PCBA_SN_FILE, buf, AMT_PCBA_SN_SIZE); status != PUB_ERR_NONE) {
        return status;
    }
    PUB_LOG(g_amt_handle_log, "read pcba-sn: %s", buf);
    return PUB_ERR_NONE;
}

int amt_read_data_from_file(char *buf, uint32_t size, const char *path)
{
    pub_log_entry(g_amt_handle_log);
    if (buf == nullptr || size == 0 || path == nullptr) {
        return pub_log_bad_param(g_amt_handle_log, {buf == nullptr, size == 0, path == nullptr});
    }
    if (const int status = read_first_line(path, buf, size); status != PUB_ERR_NONE) {
        return status;
    }
    PUB_LOG(g_amt_handle_log, "read content: %s", buf);
    return PUB_ERR_NONE;
}

const char *get_bt_addr_file()
{
    pub_log_entry(g_amt_handle_log);
    for (const char *const path : {AMT_BT_ADDRESS_FILE, BT_ADDRESS_FILE_2}) {
        if (access(path, F_OK) == 0) {
            return path;
        }
    }
    pub_log_fail(g_amt_handle_log, PUB_ERR_FILE, "can not access file \"%s\" or \"%s\"", AMT_BT_ADDRESS_FILE,
                 BT_ADDRESS_FILE_2);
    return nullptr;
}

int amt_make_folder(const char *path)
{
    pub_log_entry(g_amt_handle_log);
    if (path == nullptr) {
        return pub_log_bad_param(g_amt_handle_log, {true});
    }
    if (access(path, F_OK) == 0) {
        PUB_LOG(g_amt_handle_log, "amt_make_folder: %s exist.\r\n", path);
        return PUB_ERR_NONE;
    }
    PUB_LOG(g_amt_handle_log, "amt_make_folder: %s does not exist.\r\n", path);
    if (mkdir(path, FOLDER_MODE) != 0) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FILE,
                            "amt_make_folder mkdir(%s) faild errno[%d] strerror[%s]", path, errno,
                            strerror(errno));
    }
    PUB_LOG(g_amt_handle_log, "amt_make_folder mkdir(%s) successfully", path);
    run_on_folder("chgrp -R radio", path);
    run_on_folder("chmod 766", path);
    return PUB_ERR_NONE;
}

int amt_read_cut_line(const char *path, char *buf, uint32_t size, const char *length_name,
                      const pub_log_place_st &place)
{
    pub_log_entry(place.m_source, place.m_func_ptr);
    const pub_file_step_en step = pub_file_read_line(path, buf, size);
    if (step == pub_file_step_en::OPEN_FAILED) {
        return pub_log_fail(place, PUB_ERR_FAIL, "open %s fail", path);
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail(place, PUB_ERR_FAIL, "read fail");
    }
    const size_t length = strlen(buf);
    PUB_LOG(place.m_source, "%s: %d", length_name, static_cast<int>(length));
    buf[length > 0 ? length - 1 : 0] = '\0';
    return PUB_ERR_NONE;
}

int amt_read_wifi_address(char *buf)
{
    char line_a[LINE_SIZE];
    const int status = amt_read_cut_line(AMT_WIFI_ADDRESS_FILE, line_a, sizeof(line_a), "wifi_addr_len");
    const char *const address = status == PUB_ERR_NONE ? line_a : "";
    snprintf(buf, AMT_WIFI_ADDRESS_SIZE, "%.*s", static_cast<int>(AMT_WIFI_ADDRESS_SIZE - 1), address);
    return status;
}

int amt_write_wifi_address(const char *text)
{
    pub_log_entry(g_amt_handle_log);
    if (text == nullptr || text[0] == '\0') {
        return pub_log_bad_param(g_amt_handle_log, {text == nullptr, text != nullptr});
    }
    const pub_file_step_en step = amt_factory_file_write(AMT_WIFI_ADDRESS_FILE, text, "\n");
    if (step == pub_file_step_en::OPEN_FAILED) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "open %s fail", AMT_WIFI_ADDRESS_FILE);
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_error_call(g_amt_handle_log, PUB_ERR_FILE, "fputs");
    }
    /* The station's log readers know this text, and it is about this file in spite of its words. */
    PUB_LOG(g_amt_handle_log, "write BT address: %s", text);
    return PUB_ERR_NONE;
}
