#include "amt/amt-cfg.h"

#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stddef.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <string>
#include <unistd.h>
#include <vector>

#include "pub/error.h"
#include "tests/unit/support/log-lines.h"

namespace {

using ::testing::ElementsAre;

class amt_cfg : public ::testing::Test {
protected:
    amt_cfg()
    {
        memset(&g_amt_cfg, 0x5A, sizeof(g_amt_cfg));
        const int fd = mkstemp(m_path_a);
        EXPECT_GT(fd, 0);
        close(fd);
        errno = 0;
    }

    ~amt_cfg() override
    {
        unlink(m_path_a);
    }

    int read(const std::string &text)
    {
        FILE *stream = fopen(m_path_a, "w");
        EXPECT_NE(stream, nullptr);
        EXPECT_EQ(fwrite(text.data(), 1, text.size(), stream), text.size());
        fclose(stream);
        return amt_cfg_init(m_path_a);
    }

    /* What was logged about settings. */
    std::vector<std::string> settings() const
    {
        std::vector<std::string> text_list;
        for (const std::string &text : m_log.texts()) {
            if (text.rfind("[cfg]", 0) == 0) {
                text_list.push_back(text);
            }
        }
        return text_list;
    }

    log_capture_c m_log;
    char m_path_a[32] = "/tmp/amt-cfg-test-XXXXXX";
};

const char *const g_text_key_a[] = {"vx.tty.pc",     "vx.tty.app",    "vx.tty.modem",
                                    "vx.tty.at.mux", "vx.audio.file", "vx.mode.file"};
const char *const g_number_key_a[] = {"vx.audio.sample.rate", "vx.audio.format", "vx.audio.frame.count",
                                      "vx.modem.uart.amt.default.baudrate",
                                      "vx.modem.uart.at.default.baudrate"};

const char *text_of(const std::string &key)
{
    if (key == "vx.tty.pc") {
        return g_amt_cfg.m_tty_pc_a;
    }
    if (key == "vx.tty.app") {
        return g_amt_cfg.m_tty_app_a;
    }
    if (key == "vx.tty.modem") {
        return g_amt_cfg.m_tty_modem_a;
    }
    if (key == "vx.tty.at.mux") {
        return g_amt_cfg.m_tty_at_mux_a;
    }
    return key == "vx.audio.file" ? g_amt_cfg.m_audio_file_a : g_amt_cfg.m_mode_file_a;
}

int32_t number_of(const std::string &key)
{
    if (key == "vx.audio.sample.rate") {
        return g_amt_cfg.m_audio_sample_rate;
    }
    if (key == "vx.audio.format") {
        return g_amt_cfg.m_audio_format;
    }
    if (key == "vx.audio.frame.count") {
        return g_amt_cfg.m_audio_frame_count;
    }
    return key == "vx.modem.uart.amt.default.baudrate" ? g_amt_cfg.m_modem_uart_amt_baudrate
                                                       : g_amt_cfg.m_modem_uart_at_baudrate;
}

bool is_default()
{
    amt_cfg_st expected = {};
    expected.m_modem_uart_at_baudrate = 115200;
    expected.m_modem_uart_amt_baudrate = 115200;
    return memcmp(&g_amt_cfg, &expected, sizeof(expected)) == 0;
}

TEST_F(amt_cfg, record_has_its_fields_in_order)
{
    EXPECT_EQ(offsetof(amt_cfg_st, m_tty_pc_a), 0U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_tty_app_a), 28U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_tty_modem_a), 56U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_tty_at_mux_a), 84U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_audio_file_a), 112U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_audio_sample_rate), 160U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_audio_format), 164U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_audio_frame_count), 168U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_mode_file_a), 172U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_modem_uart_at_baudrate), 200U);
    EXPECT_EQ(offsetof(amt_cfg_st, m_modem_uart_amt_baudrate), 204U);
}

TEST_F(amt_cfg, empty_file_leaves_the_defaults)
{
    EXPECT_EQ(read(""), PUB_ERR_NONE);
    EXPECT_TRUE(is_default());
    EXPECT_THAT(without_line_numbers(m_log), ElementsAre("amt_cfg_init()", "parse_amt_cfg()"));
    EXPECT_EQ(m_log.records()[0].m_tag, "vx-kel-amt");
    EXPECT_EQ(m_log.records()[0].m_priority, 3);
}

TEST_F(amt_cfg, whole_file)
{
    EXPECT_EQ(read("# a handset\n"
                   "vx.tty.pc = /dev/ttyGS0\n"
                   "vx.tty.app = /dev/ttyAMT\n"
                   "vx.tty.modem = /dev/ttyMODEM0\n"
                   "vx.tty.at.mux = /dev/ttyMUX1\n"
                   "\n"
                   "vx.audio.file = /system/media/test.wav\n"
                   "vx.audio.sample.rate = 44100\n"
                   "vx.audio.format = 1\n"
                   "vx.audio.frame.count = 4096\n"
                   "vx.mode.file = /amt/mode\n"
                   "vx.modem.uart.amt.default.baudrate = 921600\n"
                   "vx.modem.uart.at.default.baudrate = 460800\n"),
              PUB_ERR_NONE);
    EXPECT_STREQ(g_amt_cfg.m_tty_pc_a, "/dev/ttyGS0");
    EXPECT_STREQ(g_amt_cfg.m_tty_app_a, "/dev/ttyAMT");
    EXPECT_STREQ(g_amt_cfg.m_tty_modem_a, "/dev/ttyMODEM0");
    EXPECT_STREQ(g_amt_cfg.m_tty_at_mux_a, "/dev/ttyMUX1");
    EXPECT_STREQ(g_amt_cfg.m_audio_file_a, "/system/media/test.wav");
    EXPECT_STREQ(g_amt_cfg.m_mode_file_a, "/amt/mode");
    EXPECT_EQ(g_amt_cfg.m_audio_sample_rate, 44100);
    EXPECT_EQ(g_amt_cfg.m_audio_format, 1);
    EXPECT_EQ(g_amt_cfg.m_audio_frame_count, 4096);
    EXPECT_EQ(g_amt_cfg.m_modem_uart_amt_baudrate, 921600);
    EXPECT_EQ(g_amt_cfg.m_modem_uart_at_baudrate, 460800);
    EXPECT_THAT(settings(),
                ElementsAre("[cfg]vx.tty.pc = /dev/ttyGS0", "[cfg]vx.tty.app = /dev/ttyAMT",
                            "[cfg]vx.tty.modem = /dev/ttyMODEM0", "[cfg]vx.tty.at.mux = /dev/ttyMUX1",
                            "[cfg]vx.audio.file = /system/media/test.wav",
                            "[cfg]vx.audio.sample.rate = 44100", "[cfg]vx.audio.format = 1",
                            "[cfg]vx.audio.frame.count = 4096", "[cfg]vx.mode.file = /amt/mode",
                            "[cfg]vx.modem.uart.amt.default.baudrate = 921600",
                            "[cfg]vx.modem.uart.at.default.baudrate = 460800"));
}

TEST_F(amt_cfg, every_key_sets_its_own_field_only)
{
    for (const char *key : g_text_key_a) {
        EXPECT_EQ(read(std::string(key) + "=value\n"), PUB_ERR_NONE);
        for (const char *other : g_text_key_a) {
            EXPECT_STREQ(text_of(other), other == key ? "value" : "") << key << " " << other;
        }
        EXPECT_EQ(settings().back(), std::string("[cfg]") + key + " = value");
    }
    for (const char *key : g_number_key_a) {
        EXPECT_EQ(read(std::string(key) + "=-77\n"), PUB_ERR_NONE);
        for (const char *other : g_number_key_a) {
            const int32_t unset = strstr(other, "baudrate") != nullptr ? 115200 : 0;
            EXPECT_EQ(number_of(other), other == key ? -77 : unset) << key << " " << other;
        }
        EXPECT_EQ(settings().back(), std::string("[cfg]") + key + " = -77");
    }
}

TEST_F(amt_cfg, texts_of_every_length_are_cut_to_their_field)
{
    for (const char *key : g_text_key_a) {
        const size_t kept = std::string(key) == "vx.audio.file" ? 47 : 27;
        for (size_t length = 1; length < 60; length++) {
            const std::string value = std::string("/0123456789abcdefghijklmnopqrstuvwxyz"
                                                  "ABCDEFGHIJKLMNOPQRSTUVWXYZ")
                                          .substr(0, length);
            EXPECT_EQ(read(std::string(key) + "=" + value + "\n"), PUB_ERR_NONE);
            EXPECT_EQ(text_of(key), value.substr(0, kept)) << key << " " << length;
            EXPECT_EQ(settings().back(), std::string("[cfg]") + key + " = " + value.substr(0, kept));
        }
    }
}

TEST_F(amt_cfg, blanks_and_carriage_return_around_a_setting)
{
    EXPECT_EQ(read("   vx.tty.pc   =   /dev/ttyX   \r\n"), PUB_ERR_NONE);
    EXPECT_STREQ(g_amt_cfg.m_tty_pc_a, "/dev/ttyX\0");
}

TEST_F(amt_cfg, carriage_return_lines)
{
    EXPECT_EQ(read("vx.tty.pc=/dev/a\r\nvx.audio.format=3\r\r\nvx.tty.app=b\r"), PUB_ERR_NONE);
    EXPECT_THAT(settings(),
                ElementsAre("[cfg]vx.tty.pc = /dev/a", "[cfg]vx.audio.format = 3", "[cfg]vx.tty.app = b"));
}

TEST_F(amt_cfg, lines_that_set_nothing_are_passed_over_in_silence)
{
    EXPECT_EQ(read("#vx.tty.pc=/dev/a\n"
                   "  # x = y\n"
                   "vx.tty.pc=\n"
                   "vx.tty.pc=   \n"
                   "=/dev/a\n"
                   "  = /dev/a\n"
                   "=\n"
                   "vx.tty.pc\n"
                   "vx.tty.pc /dev/a\n"
                   "VX.TTY.PC=/dev/a\n"
                   "vx.tty.pcx=/dev/a\n"
                   "vx.tty.p=/dev/a\n"
                   "vx.tty pc=/dev/a\n"
                   "vx.tty.pc\t=/dev/a\n"
                   "\tvx.tty.pc=/dev/a\n"
                   "\n"
                   "   \n"
                   "\r\n"),
              PUB_ERR_NONE);
    EXPECT_TRUE(is_default());
    EXPECT_THAT(without_line_numbers(m_log), ElementsAre("amt_cfg_init()", "parse_amt_cfg()"));
}

TEST_F(amt_cfg, tabs_belong_to_the_value)
{
    EXPECT_EQ(read("vx.tty.pc=\t/dev/a\t\n"), PUB_ERR_NONE);
    EXPECT_STREQ(g_amt_cfg.m_tty_pc_a, "\t/dev/a\t");
}

TEST_F(amt_cfg, value_may_hold_the_equals_sign_and_blanks)
{
    EXPECT_EQ(read("vx.tty.pc=a = b#c\n"), PUB_ERR_NONE);
    EXPECT_STREQ(g_amt_cfg.m_tty_pc_a, "a = b#c");
}

TEST_F(amt_cfg, later_setting_wins_and_clears_the_rest_of_an_earlier_one)
{
    EXPECT_EQ(read("vx.tty.pc=/dev/a-long-name\nvx.tty.pc=/b\nvx.audio.format=1\nvx.audio.format=2\n"),
              PUB_ERR_NONE);
    char expected_a[28] = "/b";
    EXPECT_EQ(memcmp(g_amt_cfg.m_tty_pc_a, expected_a, sizeof(expected_a)), 0);
    EXPECT_EQ(g_amt_cfg.m_audio_format, 2);
    EXPECT_EQ(settings().size(), 4U);
}

TEST_F(amt_cfg, last_line_needs_no_newline)
{
    EXPECT_EQ(read("vx.tty.app=x\nvx.tty.pc=/dev/last"), PUB_ERR_NONE);
    EXPECT_STREQ(g_amt_cfg.m_tty_pc_a, "/dev/last");
}

TEST_F(amt_cfg, numbers)
{
    const std::pair<const char *, int32_t> number_a[] = {
        {"0", 0},
        {"9600", 9600},
        {"-1", -1},
        {"+5", 5},
        {"fast", 0},
        {"12fast", 12},
        {"0x10", 0},
        {"010", 10},
        {"2147483647", INT32_MAX},
        {"2147483648", INT32_MAX},
        {"-2147483648", INT32_MIN},
        {"-2147483649", INT32_MIN},
        {"99999999999999999999999999", INT32_MAX},
    };
    for (const auto &[text, number] : number_a) {
        EXPECT_EQ(read(std::string("vx.modem.uart.at.default.baudrate=") + text + "\n"), PUB_ERR_NONE);
        EXPECT_EQ(g_amt_cfg.m_modem_uart_at_baudrate, number) << text;
        EXPECT_EQ(settings().back(), "[cfg]vx.modem.uart.at.default.baudrate = " + std::to_string(number));
    }
}

TEST_F(amt_cfg, line_counts_up_to_100_characters)
{
    for (size_t blanks = 60; blanks <= 110; blanks++) {
        const std::string head = "vx.audio.sample.rate=" + std::string(blanks, ' ');
        EXPECT_EQ(read(head + "12345\nvx.audio.format=7\n"), PUB_ERR_NONE);
        const size_t kept = head.size() >= 100 ? 0 : 100 - head.size();
        const std::string digits = std::string("12345").substr(0, kept);
        EXPECT_EQ(g_amt_cfg.m_audio_sample_rate, digits.empty() ? 0 : std::stoi(digits)) << blanks;
        EXPECT_EQ(g_amt_cfg.m_audio_format, 7); /* the next line is whole again */
    }
}

TEST_F(amt_cfg, second_reading_forgets_the_first)
{
    EXPECT_EQ(read("vx.tty.pc=/dev/a\nvx.modem.uart.at.default.baudrate=1\n"), PUB_ERR_NONE);
    EXPECT_EQ(read(""), PUB_ERR_NONE);
    EXPECT_TRUE(is_default());
}

TEST_F(amt_cfg, zero_bytes_in_the_file_end_the_text_of_a_line)
{
    EXPECT_EQ(read(std::string("vx.tty.pc=/dev/a\0rest\nvx.tty.app=b\n", 35)), PUB_ERR_NONE);
    EXPECT_STREQ(g_amt_cfg.m_tty_pc_a, "/dev/a");
    EXPECT_STREQ(g_amt_cfg.m_tty_app_a, "b");
}

TEST_F(amt_cfg, absent_path)
{
    EXPECT_EQ(amt_cfg_init(nullptr), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre("amt_cfg_init()", error_line("amt/amt-cfg", "amt_cfg_init", -101), "1"));
}

TEST_F(amt_cfg, file_that_cannot_be_opened)
{
    const std::string path = std::string(m_path_a) + "/missing";
    unlink(m_path_a);
    EXPECT_EQ(amt_cfg_init(path.c_str()), PUB_ERR_FILE);
    EXPECT_THAT(without_line_numbers(m_log),
                ElementsAre("amt_cfg_init()", "parse_amt_cfg()",
                            "sys call: fopen() failed! errno = " + std::to_string(ENOENT),
                            error_line("amt/amt-cfg", "parse_amt_cfg", -1, ENOENT),
                            error_line("amt/amt-cfg", "parse_amt_cfg", -118, ENOENT),
                            "fail to open file: " + path));
    EXPECT_TRUE(is_default());
}

} // namespace
