#include <dlfcn.h>
#include <gmock/gmock.h>
#include <string.h>

#include "platform/include/amt-misc-hal.h"
#include "platform/include/audio-loop-hal.h"
#include "platform/include/ldt.h"
#include "tests/unit/platform/support.h"

namespace {

/* Calls an entry of a library that is loaded for this one call, as the daemon does it. */
template <typename func_type, typename... argument_types>
int32_t call_once(const char *library, const char *entry, argument_types... arguments)
{
    const char *name = strrchr(library, '/') + 1;
    void *handle = dlopen((std::string(TEST_LIBRARY_DIRECTORY "/") + name).c_str(), RTLD_LAZY);
    EXPECT_NE(handle, nullptr) << dlerror();
    const func_type function = reinterpret_cast<func_type>(dlsym(handle, entry));
    EXPECT_NE(function, nullptr) << entry;
    const int32_t result = function(arguments...);
    dlclose(handle);
    return result;
}

int32_t sanity()
{
    return call_once<amt_misc_hal_check_sanity_func>(AMT_MISC_HAL_LIBRARY, AMT_MISC_HAL_CHECK_SANITY);
}

} // namespace

class answers_test : public stand_in_test {};

TEST_F(answers_test, without_a_script_everything_succeeds)
{
    EXPECT_EQ(ldt_btCtrl(1), 0);
    EXPECT_EQ(ldt_btCheck(), 0);
    EXPECT_EQ(ldt_wifiCtrl(0), 0);
    EXPECT_EQ(ldt_wifiCheck(), 0);
    EXPECT_EQ(ldt_TxTest(1, 15, 550, 11), 0);
    EXPECT_EQ(ldt_RxTest(1, 6, 540, nullptr), 0);
    int32_t count = 0;
    EXPECT_EQ(ldt_RxTest(0, 6, 0, &count), 0);
    EXPECT_EQ(count, 1000);
    EXPECT_EQ(ldt_gpsCtrl(1, 0, nullptr, nullptr), 0);
    int32_t svid = 0;
    int32_t cnr = 0;
    EXPECT_EQ(ldt_gpsCtrl(2, 3, &svid, &cnr), 0);
    EXPECT_EQ(svid, 4);
    EXPECT_EQ(cnr, 41);
    EXPECT_EQ(ldt_gpsCheck(), 0);
    EXPECT_THAT(calls(),
                testing::ElementsAre("ldt_btCtrl(1) = 0", "ldt_btCheck() = 0", "ldt_wifiCtrl(0) = 0",
                                     "ldt_wifiCheck() = 0", "ldt_TxTest(1, 15, 550, 11) = 0",
                                     "ldt_RxTest(1, 6, 540, null) = 0", "ldt_RxTest(0, 6, 0, out) = 0 [1000]",
                                     "ldt_gpsCtrl(1, 0, null, null) = 0",
                                     "ldt_gpsCtrl(2, 3, out, out) = 0 [4 41]", "ldt_gpsCheck() = 0"));
}

TEST_F(answers_test, the_nth_call_takes_line_n_and_the_last_line_stays)
{
    write("answers/ldt_btCheck", "-1\n0\n7\n");
    EXPECT_EQ(ldt_btCheck(), -1);
    EXPECT_EQ(ldt_btCheck(), 0);
    EXPECT_EQ(ldt_btCheck(), 7);
    EXPECT_EQ(ldt_btCheck(), 7);
    EXPECT_EQ(ldt_wifiCheck(), 0);
    EXPECT_THAT(calls(), testing::ElementsAre("ldt_btCheck() = -1", "ldt_btCheck() = 0", "ldt_btCheck() = 7",
                                              "ldt_btCheck() = 7", "ldt_wifiCheck() = 0"));
}

TEST_F(answers_test, out_values_follow_the_return_value)
{
    write("answers/ldt_gpsCtrl", "0\n0 12 38\n-5\n-5 9\n");
    int32_t svid = 100;
    int32_t cnr = 200;
    ldt_gpsCtrl(1, 0, nullptr, nullptr);
    EXPECT_EQ(ldt_gpsCtrl(2, 0, &svid, &cnr), 0);
    EXPECT_EQ(svid, 12);
    EXPECT_EQ(cnr, 38);
    svid = 100;
    cnr = 200;
    EXPECT_EQ(ldt_gpsCtrl(2, 0, &svid, &cnr), -5); /* a failing call leaves the values alone */
    EXPECT_EQ(svid, 100);
    EXPECT_EQ(cnr, 200);
    EXPECT_EQ(ldt_gpsCtrl(2, 0, &svid, &cnr), -5);
    EXPECT_EQ(svid, 9);
    EXPECT_EQ(cnr, 200);
}

TEST_F(answers_test, comments_blank_lines_and_a_missing_line_end)
{
    write("answers/ldt_btCheck", "# fails once\n\n-3\r\n\n# then works\n0");
    EXPECT_EQ(ldt_btCheck(), -3);
    EXPECT_EQ(ldt_btCheck(), 0);
    EXPECT_EQ(ldt_btCheck(), 0);
}

TEST_F(answers_test, an_empty_script_is_none)
{
    write("answers/ldt_btCheck", "");
    EXPECT_EQ(ldt_btCheck(), 0);
    write("answers/ldt_wifiCheck", "# nothing yet\n");
    EXPECT_EQ(ldt_wifiCheck(), 0);
}

TEST_F(answers_test, a_line_without_a_number_shows_in_the_record)
{
    write("answers/ldt_btCheck", "fail\n");
    EXPECT_EQ(ldt_btCheck(), 0);
    EXPECT_THAT(calls(), testing::ElementsAre("# answers/ldt_btCheck: no return value in \"fail\"",
                                              "ldt_btCheck() = 0"));
}

TEST_F(answers_test, a_changed_script_starts_over)
{
    write("answers/ldt_btCheck", "1\n2\n");
    EXPECT_EQ(ldt_btCheck(), 1);
    EXPECT_EQ(ldt_btCheck(), 2);
    write("answers/ldt_btCheck", "10\n20\n30\n");
    EXPECT_EQ(ldt_btCheck(), 10);
    EXPECT_EQ(ldt_btCheck(), 20);
}

TEST_F(answers_test, calls_are_counted_over_all_processes)
{
    write("answers/ldt_btCtrl", "1\n2\n3\n4\n");
    EXPECT_EQ(ldt_btCtrl(1), 1);
    EXPECT_EQ(in_child([] { EXPECT_EQ(ldt_btCtrl(1), 2); }), 0);
    EXPECT_EQ(in_child([] { EXPECT_EQ(ldt_btCtrl(1), 3); }), 0);
    EXPECT_EQ(ldt_btCtrl(1), 4);
}

TEST_F(answers_test, a_library_loaded_for_each_call_keeps_its_place)
{
    write("answers/amt_check_system_sanity", "1\n0\n-2\n");
    EXPECT_EQ(sanity(), 1);
    EXPECT_EQ(sanity(), 0);
    EXPECT_EQ(sanity(), -2);
    EXPECT_EQ(sanity(), -2);
    EXPECT_EQ(calls().back(), "amt_check_system_sanity() = -2");
}

TEST_F(answers_test, entries_of_the_test_hal)
{
    write("answers/enter_idle", "-7\n");
    EXPECT_EQ(call_once<amt_misc_hal_enter_idle_func>(AMT_MISC_HAL_LIBRARY, AMT_MISC_HAL_ENTER_IDLE), -7);
    EXPECT_EQ(call_once<amt_misc_hal_usb_charger_enable_func>(AMT_MISC_HAL_LIBRARY,
                                                              AMT_MISC_HAL_USB_CHARGER_ENABLE, 2),
              0);
    EXPECT_EQ(sanity(), 0);
    EXPECT_THAT(calls(), testing::ElementsAre("enter_idle() = -7", "amt_usb_charger_enable(2) = 0",
                                              "amt_check_system_sanity() = 0"));
}

class devinfo_test : public answers_test {
protected:
    static constexpr int32_t capacity = 4055;
    char m_text_a[capacity + 1] = {};

    int32_t create()
    {
        return call_once<amt_misc_hal_create_devinfo_func>(AMT_MISC_HAL_LIBRARY, AMT_MISC_HAL_CREATE_DEVINFO,
                                                           m_text_a, capacity);
    }
};

TEST_F(devinfo_test, plausible_without_a_script)
{
    EXPECT_EQ(create(), 0);
    EXPECT_THAT(m_text_a, testing::HasSubstr("tq5530"));
    EXPECT_EQ(calls().back(),
              "create_devinfo(out, 4055) = 0 [" + std::to_string(strlen(m_text_a)) + " characters]");
}

TEST_F(devinfo_test, the_text_is_the_rest_of_the_line)
{
    write("answers/create_devinfo", "0 board: A1; ram: 2 GB\\nlcd: x\n-4\n");
    EXPECT_EQ(create(), 0);
    EXPECT_STREQ(m_text_a, "board: A1; ram: 2 GB\nlcd: x");
    EXPECT_EQ(create(), -4);
    EXPECT_STREQ(m_text_a, "");
}

TEST_F(devinfo_test, a_text_too_long_is_cut_to_the_capacity)
{
    write("answers/create_devinfo", "0 " + std::string(6000, 'i') + "\n");
    EXPECT_EQ(create(), 0);
    EXPECT_EQ(std::string(m_text_a), std::string(4055, 'i'));
}

TEST_F(answers_test, entry_of_the_audio_hal)
{
    write("answers/codec_loop_test", "3\n");
    EXPECT_EQ(call_once<audio_loop_hal_codec_loop_test_func>(AUDIO_LOOP_HAL_LIBRARY,
                                                             AUDIO_LOOP_HAL_CODEC_LOOP_TEST, 2, 1),
              3);
    EXPECT_THAT(calls(), testing::ElementsAre("codec_loop_test(2, 1) = 3"));
}

TEST_F(answers_test, without_an_environment_all_is_silent)
{
    unsetenv("VX_HOST_CALLS");
    unsetenv("VX_HOST_ANSWERS");
    EXPECT_EQ(ldt_btCheck(), 0);
    EXPECT_FALSE(exists("calls.txt"));
}
