#include "amt/amt-handle/at/at-handler.h"

#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>

#include "amt/amt-handle/at/at-operand.h"
#include "amt/amt-handle/channel/factory-file.h"
#include "amt/amt-handle/request/handshake-permission.h"
#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "pub/error.h"

namespace {

constexpr uint32_t ADDRESS_SIZE = 20; /* 19 characters */
constexpr uint32_t LINE_SIZE = 100;

constexpr int PCBA_READ = 1;
constexpr int PCBA_WRITE = 2;

/* Reads one word of the Bluetooth address file into word (LINE_SIZE bytes). */
int read_bt_address(char *word)
{
    const char *const path = get_bt_addr_file();
    if (path == nullptr) {
        return PUB_ERR_FILE;
    }
    const pub_file_step_en step = pub_file_read_word(path, word, LINE_SIZE);
    if (step == pub_file_step_en::OPEN_FAILED) {
        return amt_factory_file_fail_open(path);
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "read not completed");
    }
    return PUB_ERR_NONE;
}

/* Writes the address to the file that holds one, or to where the first one goes. */
int write_bt_address(const char *address)
{
    const char *const known_path = get_bt_addr_file();
    const char *const path = known_path != nullptr ? known_path : AMT_BT_ADDRESS_FILE;
    const pub_file_step_en step = amt_factory_file_write(path, address, "\n");
    if (step == pub_file_step_en::OPEN_FAILED) {
        return amt_factory_file_fail_open(path);
    }
    if (step != pub_file_step_en::DONE) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FILE, "fputs() fail");
    }
    PUB_LOG(g_amt_handle_log, "write BT address: %s", address);
    return PUB_ERR_NONE;
}

int reply_pcba_sn()
{
    char sn_a[AMT_PCBA_SN_SIZE] = {};
    if (amt_read_pcba_sn(sn_a) != PUB_ERR_NONE) {
        pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "read error.");
        return amt_at_reply_error();
    }
    return amt_at_reply("\r\n^DPCBACTRL: %s\r\n\r\nOK\r\n", sn_a);
}

int write_pcba_sn(const char *sn)
{
    char sn_a[AMT_PCBA_SN_SIZE];
    snprintf(sn_a, sizeof(sn_a), "%s", sn);
    if (amt_write_pcba_sn(sn_a, AMT_PCBA_SN_FILE) != PUB_ERR_NONE) {
        pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "write error.");
        return amt_at_reply_error();
    }
    return amt_at_reply_ok();
}

} // namespace

int amt_at_read_bt_address(const char *)
{
    char word_a[LINE_SIZE] = {};
    if (read_bt_address(word_a) != PUB_ERR_NONE) {
        return amt_at_reply_cme();
    }
    return amt_at_reply("\r\n^DBTADDR: \"%s\"\r\n\r\nOK\r\n", word_a);
}

int amt_at_write_bt_address(const char *operands)
{
    char address_a[ADDRESS_SIZE];
    amt_at_copy_quoted(operands, address_a, sizeof(address_a));
    if (address_a[0] == '\0') {
        return pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
    }
    return write_bt_address(address_a) == PUB_ERR_NONE ? amt_at_reply_ok() : amt_at_reply_cme();
}

int amt_at_read_wifi_address(const char *)
{
    char line_a[LINE_SIZE] = {};
    if (amt_read_wifi_address(line_a) != PUB_ERR_NONE) {
        return amt_at_reply_cme();
    }
    return amt_at_reply("\r\n^DWIFIADDR: \"%s\"\r\n\r\nOK\r\n", line_a);
}

int amt_at_write_wifi_address(const char *operands)
{
    char address_a[ADDRESS_SIZE];
    amt_at_copy_quoted(operands, address_a, sizeof(address_a));
    return amt_write_wifi_address(address_a) == PUB_ERR_NONE ? amt_at_reply_ok() : amt_at_reply_cme();
}

int amt_at_control_pcba(const char *operands)
{
    amt_at_operands_st list;
    amt_at_operands_init(&list, operands);
    const char *const type_ptr = amt_at_operands_next(&list);
    if (type_ptr == nullptr) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "type is null!!!");
    }
    const int type = atoi(type_ptr);
    if (type == PCBA_READ) {
        return reply_pcba_sn();
    }
    if (type == PCBA_WRITE) {
        const char *const sn = amt_at_operands_next(&list);
        return sn != nullptr ? write_pcba_sn(sn)
                             : pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "pcba-sn is null!!!");
    }
    pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "unknown operation type: %u", static_cast<unsigned>(type));
    return amt_at_reply_error();
}

int amt_at_control_permission(const char *operands)
{
    amt_at_operands_st list;
    amt_at_operands_init(&list, operands);
    const char *const type_ptr = amt_at_operands_next(&list);
    if (type_ptr == nullptr) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "type is null!!!");
    }
    const int type = atoi(type_ptr);
    int flag = 0;
    if (handle_amt_damt1_operation(type, &flag) != PUB_ERR_NONE) {
        return amt_at_reply_error();
    }
    return type == static_cast<int>(amt_permission_en::READ)
               ? amt_at_reply("\r\n^DAMT1: %d\r\n\r\nOK\r\n", flag)
               : amt_at_reply_ok();
}

int amt_at_test_only(const char *)
{
    return amt_at_reply_ok();
}
