#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <map>
#include <set>
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

namespace {

/* What an init of platform level 21 knows, as far as the shipped file could use it. */
const std::set<std::string> g_commands = {
    "chmod",   "chown",   "class_reset", "class_start", "class_stop", "load_all_props", "mkdir", "mount",
    "restart", "setprop", "start",       "stop",        "symlink",    "trigger",        "wait",  "write"};
const std::set<std::string> g_options = {"class",  "console",  "critical", "disabled",  "group",
                                         "ioprio", "keycodes", "oneshot",  "onrestart", "seclabel",
                                         "setenv", "socket",   "user"};
const std::set<std::string> g_triggers = {"boot", "charger",      "early-boot", "early-init",
                                          "init", "nonencrypted", "post-fs",    "post-fs-data"};
const std::set<std::string> g_mount_flags = {"nodev", "nosuid", "noatime", "noexec", "ro", "wait"};

struct init_section_st
{
    std::vector<std::string> m_head; /* the words of its first line */
    std::vector<std::vector<std::string>> m_body;
};

std::vector<std::string> split_words(const std::string &line)
{
    std::istringstream stream(line.substr(0, line.find('#')));
    return {std::istream_iterator<std::string>(stream), std::istream_iterator<std::string>()};
}

std::vector<init_section_st> init_sections()
{
    std::vector<init_section_st> sections;
    for (const std::string &line : split_lines(shipped("vx-kel-amt.rc"))) {
        const std::vector<std::string> words = split_words(line);
        if (words.empty()) {
            continue;
        }
        if (line[0] != ' ') {
            sections.push_back({words, {}});
        } else if (!sections.empty()) {
            sections.back().m_body.push_back(words);
        } else {
            ADD_FAILURE() << line;
        }
    }
    return sections;
}

bool is_known_trigger(const std::string &trigger)
{
    return g_triggers.count(trigger) == 1 || trigger.rfind("property:", 0) == 0;
}

} // namespace

TEST(android_files_test, init_knows_every_word_of_its_file)
{
    for (const init_section_st &section : init_sections()) {
        const bool is_service = section.m_head[0] == "service";
        ASSERT_TRUE(is_service || section.m_head[0] == "on") << section.m_head[0];
        if (!is_service) {
            ASSERT_EQ(section.m_head.size(), 2u);
            EXPECT_TRUE(is_known_trigger(section.m_head[1])) << section.m_head[1];
        }
        for (const std::vector<std::string> &line : section.m_body) {
            EXPECT_EQ((is_service ? g_options : g_commands).count(line[0]), 1u) << line[0];
        }
    }
}

/* A mount's last word alone may be something else than a flag: an option of the file system. */
TEST(android_files_test, init_knows_every_flag_of_a_mount)
{
    int count = 0;
    for (const init_section_st &section : init_sections()) {
        for (const std::vector<std::string> &line : section.m_body) {
            if (line[0] != "mount") {
                continue;
            }
            count++;
            ASSERT_GE(line.size(), 4u);
            for (size_t i = 4; i + 1 < line.size(); i++) {
                EXPECT_EQ(g_mount_flags.count(line[i]), 1u) << line[i];
            }
        }
    }
    EXPECT_EQ(count, 3);
}

/* The charger's boot mounts nothing by itself, and the start comes last. */
TEST(android_files_test, the_charger_mounts_what_the_service_needs)
{
    std::vector<std::string> mounted;
    std::string last;
    for (const init_section_st &section : init_sections()) {
        const bool is_early = section.m_head == std::vector<std::string>{"on", "init"};
        const bool is_charger = section.m_head == std::vector<std::string>{"on", "charger"};
        for (const std::vector<std::string> &line : section.m_body) {
            if ((is_early || is_charger) && line[0] == "mount") {
                mounted.push_back(line[3]);
            }
            if (is_charger) {
                last = line[0];
            }
        }
    }
    EXPECT_THAT(mounted, testing::ElementsAre("/tmp", "/system", "/amt"));
    EXPECT_EQ(last, "start");
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
