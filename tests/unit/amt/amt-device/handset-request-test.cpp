#include <chrono>
#include <string.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "amt/amt-cfg.h"
#include "amt/amt-device/battery.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-device/test-hal.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/modem-value.h"
#include "platform/include/amt-misc-hal.h"
#include "platform/include/audio-loop-hal.h"
#include "pub/error.h"
#include "tests/unit/amt/amt-device/shell-record.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"

/* The ends of the device requests that come before any file of the handset is touched, or when it is missing.
 */
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

bool is_handset()
{
    return access("/system/lib/hw", F_OK) == 0 || access("/system/bin", F_OK) == 0;
}

class handset_request : public testing::Test {
protected:
    int request(amt_handle_func handler, uint8_t id, const std::string &atoms)
    {
        errno = 0;
        return m_line.handle(handler, wire_packet(id, atoms));
    }

    modem_line_c m_line;
};

class missing_platform : public handset_request {
protected:
    void SetUp() override
    {
        if (is_handset()) {
            GTEST_SKIP() << "this machine has the handset's folders";
        }
    }
};

TEST_F(handset_request, the_display_request_is_only_acknowledged)
{
    EXPECT_EQ(request(amt_device_lcd_color, 29, ""), PUB_ERR_NONE);
    EXPECT_THAT(m_line.app_packets(), ElementsAre(wire_packet(30, int_atom(1, 0))));
}

TEST_F(handset_request, the_camera_refuses_another_id)
{
    EXPECT_EQ(request(amt_device_camera, 141, ""), PUB_ERR_FAIL);
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

TEST_F(handset_request, the_camera_test_refuses_another_control)
{
    for (const int32_t control_id : {0, 3, -1}) {
        const log_capture_c capture;
        EXPECT_EQ(request(amt_device_camera_control, 180, int_atom(112, control_id)), PUB_ERR_FAIL);
        EXPECT_THAT(without_line_numbers(capture),
                    ElementsAre("amt_device_camera_control()", testing::StartsWith("control_id = "),
                                error_line("amt/amt-device", "amt_device_camera_control", PUB_ERR_FAIL),
                                "invalid control_id: " + std::to_string(control_id)));
    }
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

#ifdef __GLIBC__
/* This C library does not know the conversion and leaves it in the text. */
TEST_F(handset_request, the_control_id_is_logged_as_its_format_stands)
{
    const log_capture_c capture;
    request(amt_device_camera_control, 180, int_atom(112, 3));
    EXPECT_TRUE(capture.has("control_id = %D"));
}
#endif

TEST_F(handset_request, only_the_channel_request_is_handed_on)
{
    EXPECT_EQ(request(amt_at_to_modem, 231, ""), PUB_ERR_NONE);
    EXPECT_THAT(m_line.commands(), IsEmpty());
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
    m_line.answer("\r\nOK\r\n");
    EXPECT_EQ(request(amt_at_to_modem, 232, int_atom(159, 1)), PUB_ERR_NONE);
    EXPECT_THAT(m_line.commands(), ElementsAre("AT^DMPCHN=1\r"));
    EXPECT_THAT(m_line.app_packets(), ElementsAre(wire_packet(233, int_atom(1, 0))));
    g_handle_state.m_is_no_modem = 1;
    EXPECT_EQ(request(amt_at_to_modem, 232, int_atom(159, 1)), PUB_ERR_NO_MODEM);
}

TEST_F(handset_request, the_battery_check_refuses_another_id)
{
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_battery_voltage_check, 225, ""), PUB_ERR_FAIL);
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre("amt_device_battery_voltage_check()",
                            error_line("amt/amt-device", "amt_device_battery_voltage_check", PUB_ERR_FAIL),
                            "Invalid command id[225]"));
}

TEST(battery_adc, refuses_a_null_pointer)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(amt_read_adc(nullptr), PUB_ERR_FAIL);
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre(error_line("amt/amt-device", "amt_read_adc", PUB_ERR_FAIL), "Null pointer."));
}

TEST(usb_charge, refuses_a_negative_mode_before_loading_anything)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(amt_usb_charge_ctrl(-1), PUB_ERR_PARAM);
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre("will call amt_usb_charger_enable , type:-1.",
                            error_line("amt/amt-device", "amt_usb_charge_ctrl", PUB_ERR_PARAM),
                            "parameter type(-1) is not valid."));
}

constexpr char MEASURE_COMMAND[] = "echo \"amt_get_vbatt\" > /proc/driver/sarvo_battery";

TEST_F(handset_request, an_adc_read_without_the_driver_answers_0)
{
    shell_record_c shell;
    shell.m_answer = 512;
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_battery_voltage_check, 224, ""), PUB_ERR_NONE);
    EXPECT_THAT(shell.m_commands, ElementsAre(MEASURE_COMMAND, MEASURE_COMMAND, MEASURE_COMMAND,
                                              MEASURE_COMMAND, MEASURE_COMMAND));
    EXPECT_EQ(capture.count_containing("FAIL[count = "), 5);
    EXPECT_THAT(m_line.app_packets(), ElementsAre(wire_packet(225, int_atom(151, 0) + int_atom(1, 0))));
}

/* The driver takes the command, but there is nothing to read the value from. */
TEST_F(missing_platform, an_adc_read_without_a_value_fails)
{
    const shell_record_c shell;
    const log_capture_c capture;
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(request(amt_device_battery_voltage_check, 224, ""), PUB_ERR_FAIL);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(20)) << "it measures";
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre("amt_device_battery_voltage_check()",
                            "system(" + std::string(MEASURE_COMMAND) + ") OK",
                            error_line("amt/amt-device", "amt_read_adc", PUB_ERR_FAIL, ENOENT),
                            "sys call: fopen() failed! errno = 2"));
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

void expect_loader_failure(const log_capture_c &capture, const std::string &func, const std::string &library)
{
    EXPECT_EQ(capture.count_containing("FUNC-" + func + "(), error_code=-118"), 1);
    EXPECT_EQ(capture.texts().back(), "call dlopen fail: - " + library +
                                          ": cannot open shared object file: No such file or directory");
}

TEST_F(missing_platform, the_hal_operations_fail_without_their_library)
{
    {
        const log_capture_c capture;
        EXPECT_EQ(amt_make_ue_enter_idle(), PUB_ERR_FILE);
        EXPECT_EQ(capture.texts()[0], "amt_make_ue_enter_idle()");
        expect_loader_failure(capture, "amt_make_ue_enter_idle", AMT_MISC_HAL_LIBRARY);
    }
    {
        const log_capture_c capture;
        EXPECT_EQ(amt_usb_charge_ctrl(1), PUB_ERR_FILE);
        EXPECT_EQ(capture.texts()[0], "will call amt_usb_charger_enable , type:1.");
        expect_loader_failure(capture, "amt_usb_charge_ctrl", AMT_MISC_HAL_LIBRARY);
    }
    const log_capture_c capture;
    int32_t verdict = 2;
    EXPECT_EQ(amt_boot_dl_fin_read(&verdict), PUB_ERR_FILE);
    EXPECT_EQ(verdict, 0);
    EXPECT_EQ(capture.texts()[0], "amt_boot_dl_fin_read start.");
    expect_loader_failure(capture, "amt_boot_dl_fin_read", AMT_MISC_HAL_LIBRARY);
}

TEST_F(missing_platform, the_hal_requests_fail_without_their_library)
{
    {
        const log_capture_c capture;
        EXPECT_EQ(request(amt_read_dev_info, 238, ""), PUB_ERR_FILE);
        expect_loader_failure(capture, "amt_read_dev_info", AMT_MISC_HAL_LIBRARY);
    }
    {
        const log_capture_c capture;
        EXPECT_EQ(request(amt_enter_idle, 240, ""), PUB_ERR_FILE);
        expect_loader_failure(capture, "amt_make_ue_enter_idle", AMT_MISC_HAL_LIBRARY);
    }
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_audio_loop, 31, ""), PUB_ERR_FILE);
    expect_loader_failure(capture, "amt_device_audio_loop", AUDIO_LOOP_HAL_LIBRARY);
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
}

TEST_F(missing_platform, the_boot_download_is_not_answered_without_the_library)
{
    const log_capture_c capture;
    EXPECT_EQ(m_line.handle(amt_modem_boot_dl_fin_read, wire_packet(244, ""), AMT_CHANNEL_PC), PUB_ERR_FAIL);
    EXPECT_TRUE(capture.has("amt_modem_boot_dl_fin_read."));
    EXPECT_TRUE(capture.has("amt_modem_boot_dl_fin_read finished. flag:0; ret_val:-118."));
    EXPECT_EQ(capture.texts().back(), "read error");
    EXPECT_THAT(m_line.pc_frames(), IsEmpty());
}

TEST_F(missing_platform, the_player_and_the_sound_file_are_both_named)
{
    memset(&g_amt_cfg, 0, sizeof(g_amt_cfg));
    strcpy(g_amt_cfg.m_audio_file_a, "/no/such/sound");
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_audio, 33, ""), PUB_ERR_FILE);
    EXPECT_THAT(without_line_numbers(capture),
                ElementsAre("amt_device_audio()",
                            error_line("amt/amt-device", "amt_device_audio", PUB_ERR_FILE, ENOENT),
                            "access(\"/system/bin/amt-audio\") fail: 2 - No such file or directory",
                            error_line("amt/amt-device", "amt_device_audio", PUB_ERR_FILE, ENOENT),
                            "access(\"/no/such/sound\") fail: 2 - No such file or directory"));
    EXPECT_THAT(m_line.app_packets(), IsEmpty());
    memset(&g_amt_cfg, 0, sizeof(g_amt_cfg));
}

TEST_F(missing_platform, a_missing_emmc_text_is_a_failure)
{
    const log_capture_c capture;
    EXPECT_EQ(request(amt_device_emmc_info, 246, ""), PUB_ERR_FAIL);
    EXPECT_EQ(capture.texts().back(), "read error");
    EXPECT_EQ(capture.count_containing("FUNC-amt_device_emmc_info(), error_code=-100"), 1);
}

} // namespace
