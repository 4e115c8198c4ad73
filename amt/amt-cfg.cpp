#include "amt/amt-cfg.h"

#include <limits.h>
#include <stddef.h>
#include <stdlib.h>
#include <string.h>

#include "amt/amt-log.h"
#include "pub/cfg/cfg.h"
#include "pub/error.h"
#include "pub/file/file.h"

amt_cfg_st g_amt_cfg;

namespace {

/* What counts of a line. The reader may fill all of it, so that the terminator needs one byte more. */
constexpr uint32_t LINE_SIZE = 100;

enum class kind_en : uint8_t
{
    TEXT,
    NUMBER,
};

struct key_st
{
    const char *m_name_ptr;
    kind_en m_kind;
    size_t m_offset; /* of the field in amt_cfg_st */
    size_t m_size;   /* of the field */
};

#define KEY(name, kind, field)                                                                               \
    {                                                                                                        \
        name, kind_en::kind, offsetof(amt_cfg_st, field), sizeof(amt_cfg_st::field)                          \
    }

constexpr key_st g_key_a[] = {
    KEY("vx.tty.pc", TEXT, m_tty_pc_a),
    KEY("vx.tty.app", TEXT, m_tty_app_a),
    KEY("vx.tty.modem", TEXT, m_tty_modem_a),
    KEY("vx.tty.at.mux", TEXT, m_tty_at_mux_a),
    KEY("vx.audio.file", TEXT, m_audio_file_a),
    KEY("vx.audio.sample.rate", NUMBER, m_audio_sample_rate),
    KEY("vx.audio.format", NUMBER, m_audio_format),
    KEY("vx.audio.frame.count", NUMBER, m_audio_frame_count),
    KEY("vx.mode.file", TEXT, m_mode_file_a),
    KEY("vx.modem.uart.amt.default.baudrate", NUMBER, m_modem_uart_amt_baudrate),
    KEY("vx.modem.uart.at.default.baudrate", NUMBER, m_modem_uart_at_baudrate),
};

#undef KEY

/* What lies outside the field's range becomes its nearest end; text that is no number becomes 0. */
int32_t to_number(const char *value)
{
    const long long number = strtoll(value, nullptr, 10);
    if (number > INT32_MAX) {
        return INT32_MAX;
    }
    return number < INT32_MIN ? INT32_MIN : static_cast<int32_t>(number);
}

void store(const key_st &key, const char *value)
{
    char *field = reinterpret_cast<char *>(&g_amt_cfg) + key.m_offset;
    if (key.m_kind == kind_en::NUMBER) {
        const int32_t number = to_number(value);
        memcpy(field, &number, sizeof(number));
        PUB_LOG(g_amt_cfg_log, "[cfg]%s = %d", key.m_name_ptr, number);
        return;
    }
    const size_t length = strnlen(value, key.m_size - 1);
    memset(field, 0, key.m_size);
    memcpy(field, value, length);
    PUB_LOG(g_amt_cfg_log, "[cfg]%s = %s", key.m_name_ptr, field);
}

void store_setting(const char *name, const char *value)
{
    if (name[0] == '\0' || value[0] == '\0') {
        return;
    }
    for (const key_st &key : g_key_a) {
        if (strcmp(name, key.m_name_ptr) == 0) {
            store(key, value);
            return;
        }
    }
}

int parse_amt_cfg(const char *path)
{
    pub_log_entry(g_amt_cfg_log);
    const pub_file_st file(path, pub_file_mode_en::READ);
    if (!file.is_open()) {
        pub_log_call_error(g_amt_cfg_log, "fopen", PUB_ERR_SYS_CALL);
        return pub_log_fail(g_amt_cfg_log, PUB_ERR_FILE, "fail to open file: %s", path);
    }
    char line_a[LINE_SIZE + 1] = {};
    int is_eof = 0;
    while (is_eof == 0) {
        uint32_t length = 0;
        char *name = nullptr;
        char *value = nullptr;
        if (pub_cfg_get_line(file.m_stream_ptr, line_a, LINE_SIZE, &length, &is_eof) == PUB_ERR_NONE &&
            pub_cfg_get_param_and_value(line_a, &name, &value) == PUB_ERR_NONE)
        {
            store_setting(name, value);
        }
    }
    return PUB_ERR_NONE;
}

} // namespace

int amt_cfg_init(const char *path)
{
    pub_log_entry(g_amt_cfg_log);
    if (path == nullptr) {
        return pub_log_bad_param(g_amt_cfg_log, {true});
    }
    g_amt_cfg = {};
    g_amt_cfg.m_modem_uart_at_baudrate = AMT_CFG_DEFAULT_BAUDRATE;
    g_amt_cfg.m_modem_uart_amt_baudrate = AMT_CFG_DEFAULT_BAUDRATE;
    return parse_amt_cfg(path);
}
