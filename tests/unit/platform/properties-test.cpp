#include "platform/include/cutils/properties.h"

#include <filesystem>
#include <gmock/gmock.h>
#include <string.h>
#include <thread>

#include "tests/unit/platform/support.h"

class properties_test : public stand_in_test {
protected:
    /* The value, checked to agree with the returned length. */
    static std::string get(const char *key, const char *default_value)
    {
        char value_a[PROPERTY_VALUE_MAX];
        memset(value_a, 'x', sizeof(value_a));
        const int length = property_get(key, value_a, default_value);
        EXPECT_EQ(static_cast<size_t>(length), strnlen(value_a, sizeof(value_a)));
        return value_a;
    }
};

TEST_F(properties_test, a_file_is_a_property)
{
    write("properties/ro.build.version.incremental", "1.02.003");
    EXPECT_EQ(get("ro.build.version.incremental", " "), "1.02.003");
}

TEST_F(properties_test, an_unset_property_gives_the_default)
{
    EXPECT_EQ(get("amt.normal.amt.switch_status", "@##@"), "@##@");
    EXPECT_EQ(get("amt.normal.amt.switch_status", ""), "");
    EXPECT_EQ(get("amt.normal.amt.switch_status", nullptr), "");
}

TEST_F(properties_test, an_empty_property_is_unset)
{
    write("properties/sys.usb.config", "");
    EXPECT_EQ(get("sys.usb.config", "none"), "none");
    EXPECT_EQ(get("sys.usb.config", nullptr), "");
}

TEST_F(properties_test, a_line_end_of_the_file_is_not_part_of_the_value)
{
    write("properties/a", "1\n");
    EXPECT_EQ(get("a", "0"), "1");
    write("properties/a", "\n");
    EXPECT_EQ(get("a", ""), "");
}

TEST_F(properties_test, values_and_defaults_are_cut_to_91_characters)
{
    write("properties/long", std::string(200, 'v'));
    EXPECT_EQ(get("long", ""), std::string(91, 'v'));
    EXPECT_EQ(get("none", std::string(200, 'd').c_str()), std::string(91, 'd'));
}

TEST_F(properties_test, set_writes_and_records)
{
    EXPECT_EQ(property_set("sys.usb.config", "serial,adb"), 0);
    EXPECT_EQ(read("properties/sys.usb.config"), "serial,adb");
    EXPECT_EQ(get("sys.usb.config", ""), "serial,adb");
    EXPECT_EQ(property_set("ctl.stop", "vx-kel-mla0"), 0);
    EXPECT_EQ(read("properties/ctl.stop"), "vx-kel-mla0");
    EXPECT_THAT(calls(), testing::ElementsAre("property_set(sys.usb.config, serial,adb) = 0",
                                              "property_set(ctl.stop, vx-kel-mla0) = 0"));
}

TEST_F(properties_test, set_to_nothing_unsets)
{
    property_set("a", "1");
    EXPECT_EQ(property_set("a", ""), 0);
    EXPECT_EQ(get("a", "unset"), "unset");
    EXPECT_EQ(property_set("a", nullptr), 0);
}

TEST_F(properties_test, limits_of_names_and_values)
{
    EXPECT_EQ(property_set(std::string(31, 'k').c_str(), std::string(91, 'v').c_str()), 0);
    EXPECT_EQ(get(std::string(31, 'k').c_str(), ""), std::string(91, 'v'));
    EXPECT_EQ(property_set(std::string(32, 'k').c_str(), "v"), -1);
    EXPECT_EQ(property_set("k", std::string(92, 'v').c_str()), -1);
    EXPECT_FALSE(exists("properties/k"));
}

TEST_F(properties_test, a_name_never_leaves_the_directory)
{
    write("outside", "secret");
    for (const char *key : {"../outside", "..", ".", "", "a/b", ".hidden"}) {
        EXPECT_EQ(property_set(key, "v"), -1) << key;
        EXPECT_EQ(get(key, "default"), "default") << key;
    }
    EXPECT_EQ(get(nullptr, "default"), "default");
    EXPECT_EQ(read("outside"), "secret");
}

TEST_F(properties_test, set_can_be_made_to_fail)
{
    write("answers/property_set", "-1\n0\n");
    EXPECT_EQ(property_set("a", "1"), -1);
    EXPECT_FALSE(exists("properties/a"));
    EXPECT_EQ(property_set("a", "1"), 0);
    EXPECT_THAT(calls(), testing::ElementsAre("property_set(a, 1) = -1", "property_set(a, 1) = 0"));
}

TEST_F(properties_test, without_a_directory_nothing_is_set)
{
    unsetenv("VX_HOST_PROPERTIES");
    unsetenv("VX_HOST_CALLS");
    EXPECT_EQ(property_set("a", "1"), -1);
    EXPECT_EQ(get("a", "default"), "default");
}

TEST_F(properties_test, a_reader_sees_the_old_or_the_new_value)
{
    const std::string old_value(90, 'a');
    const std::string new_value(40, 'b');
    property_set("a", old_value.c_str());
    std::thread writer([&] {
        for (int i = 0; i < 500; i++) {
            property_set("a", i % 2 == 0 ? new_value.c_str() : old_value.c_str());
        }
    });
    for (int i = 0; i < 2000; i++) {
        const std::string value = get("a", "default");
        ASSERT_TRUE(value == old_value || value == new_value) << value;
    }
    writer.join();
    for (const auto &entry : std::filesystem::directory_iterator(path("properties"))) {
        EXPECT_EQ(entry.path().filename(), "a"); /* no half-written file is left */
    }
}
