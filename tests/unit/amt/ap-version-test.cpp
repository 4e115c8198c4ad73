#include "amt/amt-handle/request/ap-version.h"

#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/request/version.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"
#include "tests/unit/support/temp-folder.h"

/*
 * The text as the properties make it. The files that add to it have absolute paths; here they are missing,
 * which makes the operation fail with the text built all the same. With them it is tested on the running
 * daemon.
 */
namespace {

class ap_version : public testing::Test {
protected:
    void SetUp() override
    {
        for (const char *const path :
             {"/sys/sarvo/board_info", "/sys/devinfo/emmc_info", "/data/orla/current/cust.prop"})
        {
            if (access(path, F_OK) == 0) {
                GTEST_SKIP() << path << " exists";
            }
        }
        setenv("VX_HOST_PROPERTIES", m_folder.path("").c_str(), 1);
    }

    void TearDown() override
    {
        unsetenv("VX_HOST_PROPERTIES");
    }

    void set(const std::string &key, const std::string &value) const
    {
        write_whole_file(m_folder.path(key), value);
    }

    /* The text that is built, although the board information is missing. */
    std::string build() const
    {
        char buf_a[AMT_AP_VERSION_SIZE + 1];
        memset(buf_a, 0x7F, sizeof(buf_a));
        uint32_t length = 99999;
        EXPECT_EQ(get_ap_sw_version(buf_a, &length), PUB_ERR_FILE);
        EXPECT_LE(length, 254U);
        /* No terminator, and nothing behind the text. */
        EXPECT_EQ(std::string(buf_a + length, sizeof(buf_a) - length),
                  std::string(sizeof(buf_a) - length, 0x7F));
        return std::string(buf_a, length);
    }

    temp_folder_c m_folder;
};

TEST_F(ap_version, starts_with_the_display_id)
{
    set("ro.build.display.id", "D-1");
    set("ro.build.factory.id", "F-2");
    EXPECT_EQ(build(), "(D-1)(F-2)");
}

TEST_F(ap_version, shows_a_blank_for_an_unset_property)
{
    EXPECT_EQ(build(), "( )( )");
}

TEST_F(ap_version, knows_its_own_brand_by_customer_or_manufacturer_in_any_case)
{
    set("ro.build.version.incremental", "1.2.3");
    set("ro.build.display.vx.id", "VX-9");
    set("ro.build.factory.id", "F-2");
    for (const char *const customer : {"BRENTA", "brenta", "Brenta"}) {
        set("ro.build.customer", customer);
        EXPECT_EQ(build(), "ORLA 1.2.3(VX-9)(F-2)");
    }
    set("ro.build.customer", "other");
    set("ro.product.manufacturer", "bReNtA");
    EXPECT_EQ(build(), "ORLA 1.2.3(VX-9)(F-2)");
    set("ro.product.manufacturer", "Brenta2");
    EXPECT_EQ(build(), "( )(F-2)");
}

TEST_F(ap_version, shows_blanks_on_its_own_brand_too)
{
    set("ro.build.customer", "BRENTA");
    EXPECT_EQ(build(), "ORLA  ( )( )");
}

TEST_F(ap_version, is_cut_to_254_and_says_so)
{
    set("ro.build.customer", "BRENTA");
    set("ro.build.version.incremental", std::string(91, 'a'));
    set("ro.build.display.vx.id", std::string(91, 'b'));
    const std::string start = "ORLA " + std::string(91, 'a') + "(" + std::string(91, 'b') + ")(";
    set("ro.build.factory.id", std::string(254 - start.size() - 1, 'c'));
    {
        const log_capture_c capture;
        EXPECT_EQ(build(), start + std::string(254 - start.size() - 1, 'c') + ")");
        EXPECT_EQ(capture.count_containing("data will be discard"), 0);
    }
    set("ro.build.factory.id", std::string(91, 'c'));
    const log_capture_c capture;
    const std::string whole = start + std::string(91, 'c') + ")";
    EXPECT_EQ(build(), whole.substr(0, 254));
    EXPECT_TRUE(capture.has("getted sw-module: " + whole));
    EXPECT_TRUE(capture.has("buf's len(254) is smaller than sw's len(282). data will be discard"));
}

TEST_F(ap_version, logs_the_failures_of_its_files)
{
    const log_capture_c capture;
    build();
    EXPECT_EQ(capture.texts().front(), "get_ap_sw_version()");
    EXPECT_TRUE(capture.has("open /sys/devinfo/emmc_info fail"));
    EXPECT_TRUE(capture.has("open cm file /data/orla/current/cust.prop fail"));
    EXPECT_EQ(capture.count_containing("/sys/sarvo/board_info"), 1);
}

TEST_F(ap_version, the_pc_is_acknowledged_and_nothing_else_when_it_fails)
{
    const modem_line_c line;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(handle_amt_pc_req_version, wire_packet(45, int_atom(19, 16)), AMT_CHANNEL_PC),
              PUB_ERR_FILE);
    EXPECT_EQ(capture.texts().back(), "failed to get ap's sw version");
    EXPECT_EQ(capture.count_containing("FUNC-set_ap_sw_version_rsp(), error_code=-118"), 1);
    const std::vector<std::string> frames = line.pc_frames();
    ASSERT_EQ(frames.size(), 1U);
    EXPECT_EQ(frames[0].size(), 16U);
}

TEST(ap_version_arguments, are_checked)
{
    char buf_a[AMT_AP_VERSION_SIZE];
    uint32_t length = 7;
    const log_capture_c capture;
    EXPECT_EQ(get_ap_sw_version(nullptr, &length), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), " 1, 0");
    EXPECT_EQ(get_ap_sw_version(buf_a, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), " 0, 1");
}

} // namespace
