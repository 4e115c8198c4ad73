#pragma once

#include <stdint.h>

constexpr uint32_t AMT_CFG_PATH_SIZE = 28;
constexpr uint32_t AMT_CFG_AUDIO_FILE_SIZE = 48;

/* The line speed of both modem uses when the file sets none. */
constexpr int32_t AMT_CFG_DEFAULT_BAUDRATE = 115200;

/*
 * The settings. Texts are always terminated, longer ones cut; what the file does not set is empty or 0, but
 * for the two line speeds.
 */
struct amt_cfg_st
{
    char m_tty_pc_a[AMT_CFG_PATH_SIZE];     /* PC serial device */
    char m_tty_app_a[AMT_CFG_PATH_SIZE];    /* name under which the app's pseudo-terminal is published */
    char m_tty_modem_a[AMT_CFG_PATH_SIZE];  /* modem serial device */
    char m_tty_at_mux_a[AMT_CFG_PATH_SIZE]; /* AT multiplexer channel device */
    char m_audio_file_a[AMT_CFG_AUDIO_FILE_SIZE]; /* audio test file */
    int32_t m_audio_sample_rate;                  /* Hz */
    int32_t m_audio_format;                       /* as the platform's audio player numbers them */
    int32_t m_audio_frame_count;                  /* frames */
    char m_mode_file_a[AMT_CFG_PATH_SIZE];
    int32_t m_modem_uart_at_baudrate;  /* modem line speed in AT use, baud */
    int32_t m_modem_uart_amt_baudrate; /* modem line speed in packet use, baud */
};
static_assert(sizeof(amt_cfg_st) == 208);

/* The one record: written by amt_cfg_init before any other thread exists, only read afterwards. */
extern amt_cfg_st g_amt_cfg;

/*
 * Resets g_amt_cfg to the defaults and reads the file at path into it. What is wrong inside the file is
 * ignored line by line.
 *
 * Returns 0; PUB_ERR_PARAM for an absent path; PUB_ERR_FILE when the file cannot be opened.
 */
int amt_cfg_init(const char *path);
