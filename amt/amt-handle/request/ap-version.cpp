#include "amt/amt-handle/request/ap-version.h"

#include <stdio.h>
#include <string.h>
#include <strings.h>

#include "amt/amt-handle/request/identity-store.h"
#include "amt/amt-log.h"
#include "platform/include/cutils/properties.h"
#include "pub/error.h"
#include "pub/file/file.h"

namespace {

constexpr const char *BOARD_INFO_FILE = "/sys/sarvo/board_info";
constexpr const char *EMMC_INFO_FILE = "/sys/devinfo/emmc_info";
constexpr const char *CARRIER_FILE = "/data/orla/current/cust.prop";
constexpr const char *CARRIER_KEY = "ro.carrier.name=";

/* An unset property reads as one blank, so that its field still shows in the text. */
constexpr const char *UNSET = " ";
constexpr const char *UNSET_MAKER = "null";

constexpr uint32_t BOARD_INFO_SIZE = 92;

/* Room for a line of 48 characters, as much as is read of the eMMC and carrier files' lines. */
constexpr uint32_t LINE_SIZE = 49;
static_assert(LINE_SIZE < AMT_AP_LINE_SIZE);

/* The version text while it grows: room for every source at its longest, so that the real length can be
 * logged. */
struct version_text_st
{
    uint32_t m_len;
    char m_text_a[512];
};
constexpr size_t BRACKETS = 2;
static_assert(sizeof("ORLA ") + PROPERTY_VALUE_MAX + (PROPERTY_VALUE_MAX + BRACKETS) +
                  (PROPERTY_VALUE_MAX + BRACKETS) + (BOARD_INFO_SIZE + BRACKETS) +
                  (AMT_AP_LINE_SIZE + BRACKETS) + (AMT_AP_LINE_SIZE + BRACKETS) <
              sizeof(version_text_st::m_text_a));

void append(version_text_st *version_ptr, const char *before, const char *text, const char *after)
{
    const size_t room = sizeof(version_ptr->m_text_a) - version_ptr->m_len;
    const int length =
        snprintf(version_ptr->m_text_a + version_ptr->m_len, room, "%s%s%s", before, text, after);
    if (length > 0 && static_cast<size_t>(length) < room) {
        version_ptr->m_len += static_cast<uint32_t>(length);
    }
}

void append_field(version_text_st *version_ptr, const char *text)
{
    append(version_ptr, "(", text, ")");
}

/* Reads a property into value (PROPERTY_VALUE_MAX bytes); false when there is nothing to read. */
bool read_property(const char *key, char *value, const char *unset)
{
    memset(value, 0, PROPERTY_VALUE_MAX);
    return property_get(key, value, unset) > 0;
}

/* The failure of a property that the text starts with. */
int fail_property(const char *key, const pub_log_place_st &place = {g_amt_handle_log, "get_ap_sw_version"})
{
    return pub_log_fail(place, PUB_ERR_FAIL, "read %s error", key);
}

bool is_own_brand()
{
    char value_a[PROPERTY_VALUE_MAX];
    if (read_property("ro.build.customer", value_a, UNSET_MAKER) && strcasecmp(value_a, "BRENTA") == 0) {
        return true;
    }
    return read_property("ro.product.manufacturer", value_a, UNSET_MAKER) &&
           strcasecmp(value_a, "Brenta") == 0;
}

/* The start of the text on the maker's own brand. *is_complete_ptr tells that nothing else follows. */
int append_own_brand(version_text_st *version_ptr, bool *is_complete_ptr)
{
    char value_a[PROPERTY_VALUE_MAX];
    if (!read_property("ro.build.version.incremental", value_a, UNSET)) {
        return fail_property("ro.build.version.incremental");
    }
    append(version_ptr, "ORLA ", value_a, "");
    *is_complete_ptr = !read_property("ro.build.display.vx.id", value_a, UNSET);
    if (!*is_complete_ptr) {
        append_field(version_ptr, value_a);
    }
    return PUB_ERR_NONE;
}

/* The start of the text on every other handset. */
int append_other_brand(version_text_st *version_ptr)
{
    char value_a[PROPERTY_VALUE_MAX];
    if (!read_property("ro.build.display.id", value_a, UNSET)) {
        return fail_property("ro.build.display.id");
    }
    append_field(version_ptr, value_a);
    return PUB_ERR_NONE;
}

/* Factory id and board information. Returns the status of reading the latter, 0 when there is no factory id.
 */
int append_board(version_text_st *version_ptr)
{
    char value_a[PROPERTY_VALUE_MAX];
    if (!read_property("ro.build.factory.id", value_a, UNSET)) {
        return PUB_ERR_NONE;
    }
    append_field(version_ptr, value_a);
    char board_a[BOARD_INFO_SIZE] = {};
    const int status = amt_read_data_from_file(board_a, sizeof(board_a), BOARD_INFO_FILE);
    if (status == PUB_ERR_NONE) {
        PUB_LOG(g_amt_handle_log, "readed success from file(%s). flag: %s.", BOARD_INFO_FILE, board_a);
        append_field(version_ptr, board_a);
    }
    return status;
}

/* The fields that follow on every brand. A missing eMMC or carrier field does not count as a failure. */
int append_tail(version_text_st *version_ptr)
{
    const int status = append_board(version_ptr);
    char line_a[AMT_AP_LINE_SIZE] = {};
    if (amt_read_emmc_info(line_a) == PUB_ERR_NONE) {
        PUB_LOG(g_amt_handle_log, "emmc_info(%s). flag: %s.", EMMC_INFO_FILE, line_a);
        append_field(version_ptr, line_a);
    }
    if (amt_read_cm_info(line_a) == PUB_ERR_NONE) {
        PUB_LOG(g_amt_handle_log, "cm_info(%s). flag: %s.", CARRIER_FILE, line_a);
        append_field(version_ptr, line_a);
    }
    return status;
}

void put_text(const version_text_st &version, char *buf, uint32_t *length_ptr)
{
    constexpr uint32_t limit = AMT_AP_VERSION_SIZE - 1;
    PUB_LOG(g_amt_handle_log, "getted sw-module: %s", version.m_text_a);
    if (version.m_len > limit) {
        PUB_LOG(g_amt_handle_log, "buf's len(%u) is smaller than sw's len(%u). data will be discard", limit,
                version.m_len);
    }
    *length_ptr = version.m_len < limit ? version.m_len : limit;
    memcpy(buf, version.m_text_a, *length_ptr);
}

} // namespace

int get_ap_sw_version(char *buf, uint32_t *length_ptr)
{
    pub_log_entry(g_amt_handle_log);
    if (buf == nullptr || length_ptr == nullptr) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, " %d, %d", buf == nullptr,
                            length_ptr == nullptr);
    }
    *length_ptr = 0;
    version_text_st version = {};
    bool is_complete = false;
    int status = is_own_brand() ? append_own_brand(&version, &is_complete) : append_other_brand(&version);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    if (!is_complete) {
        status = append_tail(&version);
    }
    put_text(version, buf, length_ptr);
    return status;
}

int amt_read_emmc_info(char *buf)
{
    return amt_read_cut_line(EMMC_INFO_FILE, buf, LINE_SIZE, "emmc_info_len");
}

int amt_read_cm_info(char *buf)
{
    pub_log_entry(g_amt_handle_log);
    buf[0] = '\0';
    const pub_file_st file(CARRIER_FILE, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "open cm file %s fail", CARRIER_FILE);
    }
    char line_a[LINE_SIZE] = {};
    while (strstr(line_a, CARRIER_KEY) == nullptr) {
        if (pub_file_get_line(file, line_a, sizeof(line_a)) == 0) {
            return pub_log_error(g_amt_handle_log, PUB_ERR_FAIL);
        }
    }
    /* The path in this line is not the file's; log readers know it so. */
    PUB_LOG(g_amt_handle_log, "line_a(%s). flag: %s.", BOARD_INFO_FILE, line_a);
    sscanf(line_a, "%*[^=]=%49s", buf);
    return PUB_ERR_NONE;
}
