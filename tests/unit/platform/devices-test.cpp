#include <gmock/gmock.h>

#include "tests/unit/platform/support.h"

/* Requests on the device stand-ins, from a program that runs with the preload library in a sandbox. */
class devices_test : public stand_in_test {
protected:
    void SetUp() override
    {
        if (!has_sandbox()) {
            GTEST_SKIP() << "bubblewrap cannot make a sandbox here";
        }
        write("fb0", std::string(size_t{480} * 800 * 4 * 2, '\0'));
        write("video0", "");
        write("tty0", "");
        write("sarvo_battery", "");
    }

    std::vector<std::string> probe(const std::string &steps) const
    {
        return split_lines(
            run_in_handset("LD_PRELOAD=/tmp/lib/libhandset-devices.so exec /tmp/bin/device-probe " + steps)
                .m_output);
    }
};

#define FB  "/dev/graphics/fb0:"
#define CAM "/dev/video0:"
#define TTY "/dev/tty0:"

TEST_F(devices_test, framebuffer_describes_itself)
{
    EXPECT_THAT(probe(FB "FIXED " FB "VARIABLE"),
                testing::ElementsAre("smem_len=3072000 line_length=1920 0",
                                     "480x800 virtual 1600 offset 0 depth 32 0"));
    EXPECT_THAT(calls(), testing::ElementsAre("ioctl(fb0, FBIOGET_FSCREENINFO) = 0",
                                              "ioctl(fb0, FBIOGET_VSCREENINFO) = 0"));
    EXPECT_FALSE(exists("devices/framebuffer")); /* asking changes nothing */
}

TEST_F(devices_test, framebuffer_is_what_its_file_says)
{
    write("devices/framebuffer",
          "xres = 346\nyres=390\n  yres_virtual = 780\nyoffset = 390\nsmem_len = 4096\n");
    EXPECT_THAT(probe(FB "FIXED " FB "VARIABLE"),
                testing::ElementsAre("smem_len=4096 line_length=1920 0",
                                     "346x390 virtual 780 offset 390 depth 32 0"));
}

TEST_F(devices_test, page_flip_and_layer_are_kept_and_recorded_in_order)
{
    EXPECT_THAT(probe(FB "EN_LAYER=0 " FB "SET_FORMAT=1 " FB "PAN=800 " FB "EN_LAYER=1 " FB "VARIABLE"),
                testing::ElementsAre("0", "0", "0", "0", "480x800 virtual 1600 offset 800 depth 16 0"));
    EXPECT_THAT(calls(), testing::ElementsAre("ioctl(fb0, SARVOFB_IOCTL_EN_LAYER, 0) = 0",
                                              "ioctl(fb0, SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT, 1) = 0",
                                              "ioctl(fb0, FBIOGET_VSCREENINFO) = 0",
                                              "ioctl(fb0, FBIOPUT_VSCREENINFO, yoffset=800) = 0",
                                              "ioctl(fb0, SARVOFB_IOCTL_EN_LAYER, 1) = 0",
                                              "ioctl(fb0, FBIOGET_VSCREENINFO) = 0"));
    EXPECT_THAT(lines("devices/framebuffer"),
                testing::ElementsAre("xres = 480", "yres = 800", "xres_virtual = 480", "yres_virtual = 1600",
                                     "xoffset = 0", "yoffset = 800", "bits_per_pixel = 16",
                                     "line_length = 1920", "smem_len = 0", "layer_enabled = 1",
                                     "layer_format = 1"));
}

TEST_F(devices_test, framebuffer_refuses_what_a_driver_refuses)
{
    EXPECT_THAT(probe(FB "PAN=801 " FB "EN_LAYER=2 " FB "EN_LAYER=-1 " FB "SET_FORMAT=256 " FB "NULL"),
                testing::ElementsAre("-1 EINVAL", "-1 EINVAL", "-1 EINVAL", "-1 EINVAL", "-1 EFAULT"));
    EXPECT_EQ(calls()[1], "ioctl(fb0, FBIOPUT_VSCREENINFO, yoffset=801) = -1 EINVAL");
    EXPECT_FALSE(exists("devices/framebuffer"));
}

TEST_F(devices_test, camera_and_console_keep_their_state)
{
    EXPECT_THAT(probe(CAM "PREVIEW=1 " CAM "S_INPUT=1 " CAM "SELF_TEST=1 " TTY "KDSETMODE=1"),
                testing::ElementsAre("0", "0", "0", "0"));
    EXPECT_THAT(calls(), testing::ElementsAre("ioctl(video0, SARVOCAM_IOCTL_PREVIEW, 1) = 0",
                                              "ioctl(video0, VIDIOC_S_INPUT, 1) = 0",
                                              "ioctl(video0, SARVOCAM_IOCTL_SELF_TEST, 1) = 0",
                                              "ioctl(tty0, KDSETMODE, 1) = 0"));
    EXPECT_EQ(read("devices/camera"), "input = 1\npreview = 1\nself_test = 1\n");
    EXPECT_EQ(read("devices/console"), "mode = 1\n");
}

TEST_F(devices_test, requests_answer_as_scripted)
{
    write("answers/VIDIOC_S_INPUT", "-1 ENODEV\n-1 22\n0\n");
    write("answers/SARVOCAM_IOCTL_SELF_TEST", "5\n-1\n");
    write("answers/SARVOFB_IOCTL_EN_LAYER", "-1 ENOTTY\n");
    EXPECT_THAT(probe(CAM "S_INPUT=1 " CAM "S_INPUT=1 " CAM "S_INPUT=1 " CAM "SELF_TEST=0 " CAM
                          "SELF_TEST=0 " FB "EN_LAYER=0 " FB "EN_LAYER=0"),
                testing::ElementsAre("-1 ENODEV", "-1 EINVAL", "0", "5", "-1 EIO", "-1 ENOTTY", "-1 ENOTTY"));
    EXPECT_EQ(calls()[0], "ioctl(video0, VIDIOC_S_INPUT, 1) = -1 ENODEV");
    EXPECT_EQ(calls()[3], "ioctl(video0, SARVOCAM_IOCTL_SELF_TEST, 0) = 5");
}

TEST_F(devices_test, other_files_and_other_requests_go_to_the_kernel)
{
    EXPECT_THAT(
        probe("/tmp/handset/tty0:WINDOW_SIZE " TTY "WINDOW_SIZE /dev/null:KDSETMODE=1 " CAM "KDSETMODE=1 " FB
              "S_INPUT=1 /nowhere:KDSETMODE=1"),
        testing::ElementsAre("-1 ENOTTY", "-1 ENOTTY", "-1 ENOTTY", "-1 ENOTTY", "-1 ENOTTY", "-1 EBADF"));
    EXPECT_THAT(calls(), testing::IsEmpty());
}

TEST_F(devices_test, without_a_directory_of_devices_the_library_is_off)
{
    const result_st result =
        run_in_handset("unset VX_HOST_DEVICES; echo amt_get_vbatt > /proc/driver/sarvo_battery;"
                       "LD_PRELOAD=/tmp/lib/libhandset-devices.so /tmp/bin/device-probe " TTY
                       "KDSETMODE=1 read:/proc/driver/sarvo_battery");
    EXPECT_EQ(result.m_output, "-1 ENOTTY\n1 amt_get_vbatt\n");
    EXPECT_THAT(calls(), testing::IsEmpty());
}

#define BATTERY  "read:/proc/driver/sarvo_battery"
#define ASK_ADC  "echo \"amt_get_vbatt\" > /proc/driver/sarvo_battery; "
#define PRELOAD  "export LD_PRELOAD=/tmp/lib/libhandset-devices.so; "
#define RUN_READ "/tmp/bin/device-probe " BATTERY "; "

TEST_F(devices_test, battery_answers_the_adc_number_after_it_was_asked)
{
    EXPECT_EQ(run_in_handset(PRELOAD RUN_READ ASK_ADC RUN_READ).m_output, "-1 nothing\n1 3700\n");
    EXPECT_EQ(read("sarvo_battery"), "amt_get_vbatt\n"); /* what was written stays visible */
    write("devices/battery-adc", "3812\n");
    EXPECT_EQ(run_in_handset(PRELOAD RUN_READ).m_output, "1 3812\n");
    EXPECT_EQ(calls().back(), "fopen(sarvo_battery) = 0 [3812]");
}

TEST_F(devices_test, battery_keeps_calibration_values)
{
    write("devices/battery-adc", "3812");
    const result_st result = run_in_handset(
        PRELOAD "echo \"amt_set_vbatt[1] [2] [3] [4]\" > /proc/driver/sarvo_battery; " RUN_READ);
    EXPECT_EQ(result.m_output, "1 amt_set_vbatt[1]\n");
    EXPECT_EQ(read("sarvo_battery"), "amt_set_vbatt[1] [2] [3] [4]\n");
}

TEST_F(devices_test, battery_fails_as_scripted)
{
    write("answers/sarvo_battery", "-1 EACCES\n0 garbage\n0\n");
    EXPECT_EQ(run_in_handset(PRELOAD ASK_ADC RUN_READ RUN_READ RUN_READ).m_output,
              "no file EACCES\n1 garbage\n1 3700\n");
    EXPECT_EQ(calls()[0], "fopen(sarvo_battery) = -1 EACCES");
}

TEST_F(devices_test, other_files_open_as_ever)
{
    write("hello", "hello\n");
    EXPECT_EQ(run_in_handset(PRELOAD "/tmp/bin/device-probe read:/tmp/handset/hello read:/nowhere").m_output,
              "1 hello\nno file ENOENT\n");
}
