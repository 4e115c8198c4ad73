#include <fstream>
#include <gmock/gmock.h>
#include <map>
#include <sstream>

#include "tests/unit/platform/support.h"

/* What is shipped to the handset as text. */

namespace {

std::string shipped(const std::string &name)
{
    std::ostringstream text;
    text << std::ifstream(TEST_ANDROID_DIRECTORY "/" + name).rdbuf();
    return text.str();
}

/* How long the value of each key may be; 0: it is a number. */
const std::map<std::string, size_t> g_limit = {
    {"vx.tty.pc", 27},
    {"vx.tty.app", 27},
    {"vx.tty.modem", 27},
    {"vx.tty.at.mux", 27},
    {"vx.audio.file", 47},
    {"vx.audio.sample.rate", 0},
    {"vx.audio.format", 0},
    {"vx.audio.frame.count", 0},
    {"vx.mode.file", 27},
    {"vx.modem.uart.amt.default.baudrate", 0},
    {"vx.modem.uart.at.default.baudrate", 0},
};

} // namespace

TEST(android_files_test, the_sample_configuration_sets_every_key_within_its_limit)
{
    std::map<std::string, std::string> settings;
    for (const std::string &line : split_lines(shipped("vx-kel-amt.cfg"))) {
        EXPECT_LE(line.size(), 100u) << line;
        if (line.empty() || line[0] == '#') {
            continue;
        }
        const size_t middle = line.find(" = ");
        ASSERT_NE(middle, std::string::npos) << line;
        const std::string key = line.substr(0, middle);
        const std::string value = line.substr(middle + 3);
        EXPECT_TRUE(settings.emplace(key, value).second) << key << " is set twice";
        ASSERT_EQ(g_limit.count(key), 1u) << key;
        const size_t limit = g_limit.at(key);
        EXPECT_FALSE(value.empty()) << key;
        if (limit != 0) {
            EXPECT_LE(value.size(), limit) << key;
        } else {
            EXPECT_EQ(value.find_first_not_of("0123456789"), std::string::npos) << key;
        }
    }
    EXPECT_EQ(settings.size(), g_limit.size());
}

TEST(android_files_test, init_starts_the_service_both_ways)
{
    const std::vector<std::string> lines = split_lines(shipped("vx-kel-amt.rc"));
    std::map<std::string, std::vector<std::string>> services;
    std::string service;
    for (const std::string &line : lines) {
        if (!line.empty() && line[0] != ' ') {
            service = line.rfind("service ", 0) == 0 ? line.substr(8) : "";
        }
        if (!service.empty()) {
            services[service].push_back(line);
        }
    }
    ASSERT_EQ(services.size(), 2u);
    const std::vector<std::string> &at_boot = services["vx-kel-amt /system/bin/vx-kel-amt"];
    const std::vector<std::string> &at_usb = services["vx-kel-amt-usb /system/bin/vx-kel-amt -u"];
    EXPECT_THAT(at_boot, testing::Contains("    class main"));
    EXPECT_THAT(at_boot, testing::Not(testing::Contains("    oneshot")));  /* init restarts it */
    EXPECT_THAT(at_boot, testing::Not(testing::Contains("    disabled"))); /* and starts it by itself */
    EXPECT_THAT(at_usb, testing::IsSupersetOf({"    disabled", "    oneshot"}));
    EXPECT_THAT(lines, testing::Contains("    start vx-kel-amt-usb"));
}
