#include "amt/amt-command.h"

#include <gtest/gtest.h>
#include <map>
#include <set>
#include <string>

#include "amt/amt-packet.h"

namespace {

const std::string UNDEFINED = "(undefined)";

std::string name_of(int id)
{
    return amt_cmd_name_table[id];
}

bool ends_with(const std::string &text, const std::string &end)
{
    return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

bool is_within(int id, int first, int last)
{
    return id >= first && id <= last;
}

struct row_st
{
    int m_id;
    const char *m_name_ptr;
    int m_constant;
};

const row_st g_row_a[] = {
#define AMT_COMMAND(id, name) {id, #name, name},
#include "amt/amt-command.def"
#undef AMT_COMMAND
};

TEST(amt_command, every_row_stands_at_its_id)
{
    for (const row_st &row : g_row_a) {
        EXPECT_EQ(name_of(row.m_id), row.m_name_ptr);
        EXPECT_EQ(row.m_constant, row.m_id);
    }
}

TEST(amt_command, known_ids)
{
    const std::map<int, std::string> known = {
        {0x00, "AMT_NONE_CMD"},
        {0x05, "AMT_WRITEIMEI_CMD"},
        {0x08, "AMT_READIMEI_RSPCMD"},
        {0x1A, "AMT_IQPOWER_RSPCMD"},
        {0x2B, "AMT_KEYVALUE_CMD"},
        {0x2D, "AMT_VERSION_CMD"},
        {0x2E, "AMT_VERSION_RSPCMD"},
        {0x5B, "AMT_WRITE_TEST_RESULT_CMD"},
        {0x97, "AMT_DSP_TRANSPARENT_CONTROL_CMD"},
        {0x9C, "AMT_EDGE_REFRESHTABLE_MEMORY_TO_FLASH_RSPCMD"},
        {0xAA, "AMT_BLUETOOTH_CMD"},
        {0xBB, "AMT_WIFI_RTX_TEST_CMD"},
        {0xC9, "CELL_SWITCH_MODE_CMD"},
        {0xCC, "CELL_RECIEVE_RSPDATA"},
        {0xDD, "AMT_DSP_TRANSPARENT_CONTROL_INDCMD"},
        {0xF0, "AMT_ENTER_IDLE_CMD"},
        {0xF1, "AMT_ENTER_IDLE_RSPCMD"},
        {0x2C, UNDEFINED},
        {0xFF, UNDEFINED},
    };
    for (const auto &[id, name] : known) {
        EXPECT_EQ(name_of(id), name);
    }
}

TEST(amt_command, undefined_ids_are_exactly_these)
{
    std::set<int> undefined = {0x2C, 0xC7, 0xC8, 0xCB};
    const std::pair<int, int> range_a[] = {{0x9D, 0xA9}, {0xB6, 0xB8}, {0xBD, 0xC0},
                                           {0xD7, 0xDA}, {0xDE, 0xED}, {0xF2, 0xFF}};
    for (const auto &[first, last] : range_a) {
        for (int id = first; id <= last; id++) {
            undefined.insert(id);
        }
    }
    EXPECT_EQ(undefined.size(), 58U);
    for (int id = 0; id <= UINT8_MAX; id++) {
        EXPECT_EQ(name_of(id) == UNDEFINED, undefined.count(id) == 1) << id;
    }
}

TEST(amt_command, names_are_unique)
{
    std::set<std::string> name_set;
    for (int id = 0; id <= UINT8_MAX; id++) {
        name_set.insert(name_of(id));
    }
    EXPECT_EQ(name_set.size(), 198U + 1U);
}

TEST(amt_command, responses_follow_their_requests)
{
    const std::set<int> alone = {0x00, 0x2B, 0xCC, 0xDD};
    for (int id = 0; id <= UINT8_MAX; id++) {
        const std::string name = name_of(id);
        if (name == UNDEFINED || alone.count(id) == 1) {
            continue;
        }
        const bool is_even_request = is_within(id, 0xAA, 0xB5) || is_within(id, 0xEE, 0xF1);
        const bool is_request = (id % 2 == 0) == is_even_request;
        EXPECT_EQ(ends_with(name, "_RSPCMD"), !is_request) << name;
        if (is_request) {
            ASSERT_TRUE(ends_with(name, "_CMD")) << name;
            EXPECT_EQ(name_of(id + 1), name.substr(0, name.size() - 4) + "_RSPCMD");
        }
    }
}

TEST(amt_command, prefix_tells_the_cellular_module_from_the_rest)
{
    for (int id = 0; id <= UINT8_MAX; id++) {
        const std::string name = name_of(id);
        if (name != UNDEFINED) {
            EXPECT_EQ(name.substr(0, name.find('_')), is_within(id, 0xC9, 0xD6) ? "CELL" : "AMT") << name;
        }
    }
}

TEST(amt_command, id_that_equals_the_packet_head_is_not_confused_with_it)
{
    uint8_t packet_a[AMT_PACKET_SIZE];
    amt_packet_init(packet_a, AMT_WIFI_RTX_TEST_CMD);
    EXPECT_EQ(packet_a[2], 0xBB);
    EXPECT_EQ(packet_a[3], 0xBB);
    EXPECT_EQ(name_of(amt_packet_get_cmd(packet_a)), "AMT_WIFI_RTX_TEST_CMD");
}

} // namespace
