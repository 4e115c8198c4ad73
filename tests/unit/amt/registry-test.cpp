#include "amt/amt-handle/reader/registry.h"

#include <errno.h>
#include <map>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-command.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-gps.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/identity-request.h"
#include "amt/amt-handle/request/mode-switch.h"
#include "amt/amt-handle/request/modem-tunnel.h"
#include "amt/amt-handle/request/modem-value.h"
#include "amt/amt-handle/request/test-result.h"
#include "amt/amt-handle/request/version.h"
#include "pub/error.h"
#include "tests/unit/support/log-lines.h"

namespace {

using texts_t = std::vector<std::string>;
using table_t = std::map<uint32_t, amt_handle_func>;

/* Who serves which ids, written down a second time, by numbers. */
struct served_st
{
    std::vector<uint32_t> m_ids;
    amt_handle_func m_handler;
};

const std::vector<served_st> g_pc_served = {
    {{45}, handle_amt_pc_req_version},
    {{170}, amt_device_bt},
    {{172}, amt_device_bt_address},
    {{185}, amt_device_wifi_address},
    {{187}, amt_device_wifi_rtx_test},
    {{174}, amt_gps_control},
    {{176}, amt_gps_test},
    {{178}, amt_gps_read_result},
    {{191}, amt_handle_adb_serial_no},
    {{224, 226}, amt_device_battery_voltage_check},
    {{236}, amt_handle_power_off},
    {{193}, amt_handle_board_pcba_ctrl},
    {{219}, amt_handle_not_permit_handshake},
    {{240}, amt_enter_idle},
    {{91}, amt_modem_write_pc_test_result},
    {{244}, amt_modem_boot_dl_fin_read},
    {{246}, amt_device_emmc_info},
};

const std::vector<served_st> g_app_served = {
    {{1,   3,   5,   7,   11,  13,  15,  17,  19,  21,  23,  25,  27,  39,  41,  42,  43,
      47,  49,  51,  53,  59,  61,  63,  67,  69,  71,  73,  75,  77,  79,  81,  83,  87,
      93,  95,  97,  101, 103, 105, 107, 109, 111, 113, 115, 117, 119, 121, 123, 125, 127,
      129, 131, 133, 135, 149, 151, 153, 155, 201, 204, 205, 207, 209, 211, 213, 221},
     amt_modem_handle_req},
    {{9}, amt_device_battery_voltage},
    {{29}, amt_device_lcd_color},
    {{31}, amt_device_audio_loop},
    {{33}, amt_device_audio},
    {{35}, amt_device_vibrator},
    {{37}, amt_device_button_backlight},
    {{45}, handle_amt_req_version},
    {{55}, amt_modem_handle_temperature},
    {{57}, amt_device_lcd_brightness},
    {{65}, amt_modem_handle_read_outdate},
    {{85}, amt_modem_handle_read_board},
    {{89}, amt_modem_read_test_result},
    {{91}, amt_modem_write_test_result},
    {{99}, amt_dtoc_checkSIM},
    {{137}, amt_device_tf_card},
    {{139, 147}, amt_device_camera},
    {{170}, amt_device_bt},
    {{172}, amt_device_bt_address},
    {{174}, amt_gps_control},
    {{176}, amt_gps_test},
    {{178}, amt_gps_read_result},
    {{180}, amt_device_camera_control},
    {{185}, amt_device_wifi_address},
    {{187}, amt_device_wifi_rtx_test},
    {{195}, amt_handle_normal_to_amt},
    {{197}, amt_query_amt_support},
    {{219}, amt_handle_damt1_cmd},
    {{228}, amt_item_read_test_result},
    {{230}, amt_item_write_test_result},
    {{232}, amt_at_to_modem},
    {{234}, amt_read_serial_number},
    {{238}, amt_read_dev_info},
    {{240}, amt_enter_idle},
};

table_t make_table(const std::vector<served_st> &served_list)
{
    table_t table;
    for (const served_st &served : served_list) {
        for (const uint32_t id : served.m_ids) {
            EXPECT_EQ(table.count(id), 0U) << id;
            table[id] = served.m_handler;
        }
    }
    return table;
}

void expect_table(const amt_handle_func *slot_a, const table_t &table)
{
    for (uint32_t id = 0; id < AMT_HANDLE_FUNC_COUNT; id++) {
        const auto found = table.find(id);
        EXPECT_EQ(slot_a[id], found == table.end() ? nullptr : found->second) << id;
    }
}

int serve_first(uint32_t, amt_buf_st *, amt_buf_st *)
{
    return 1;
}

int serve_second(uint32_t, amt_buf_st *, amt_buf_st *)
{
    return 2;
}

class registry : public testing::Test {
protected:
    void SetUp() override
    {
        amt_handle_clear_context();
    }
    void TearDown() override
    {
        amt_handle_clear_context();
    }
};

TEST_F(registry, fills_both_tables)
{
    amt_handle_register_all();
    expect_table(g_handle_context.m_handle_pc_func_a, make_table(g_pc_served));
    expect_table(g_handle_context.m_handle_app_func_a, make_table(g_app_served));
    EXPECT_EQ(make_table(g_pc_served).size(), 18U);
}

TEST_F(registry, leaves_two_acknowledgements_to_their_handlers)
{
    amt_handle_register_all();
    for (uint32_t id = 0; id < AMT_HANDLE_FUNC_COUNT; id++) {
        const bool is_handlers = id == AMT_VERSION_CMD || id == AMT_WRITE_TEST_RESULT_CMD;
        EXPECT_EQ(g_handle_context.m_pc_ack_a[id], is_handlers ? amt_ack_en::HANDLER : amt_ack_en::DISPATCHER)
            << id;
    }
}

TEST_F(registry, logs_each_row_and_the_one_replaced)
{
    const log_capture_c capture;
    amt_handle_register_all();
    const texts_t text_list = capture.texts();
    ASSERT_GT(text_list.size(), 20U);
    EXPECT_EQ(text_list[0], "PC register command id: 45(0x2d) - AMT_VERSION_CMD");
    EXPECT_EQ(text_list[8], "PC register command id: 191(0xbf) - (undefined)");
    EXPECT_EQ(text_list[17], "PC register command id: 246(0xf6) - (undefined)");
    EXPECT_EQ(text_list[18], "APP register command id: 1(0x01) - AMT_READFLASH_CMD");
    EXPECT_EQ(text_list.back(), "APP register command id: 219(0xdb) - AMT_DAMT1_CMD");
    EXPECT_EQ(capture.count_containing("re-register"), 1);
    EXPECT_EQ(capture.count_containing("WARNING !"), 1);
    EXPECT_EQ(capture.count_containing("clean the handle function"), 0);
}

TEST_F(registry, takes_ids_up_to_254)
{
    const log_capture_c capture;
    errno = 0;
    EXPECT_EQ(amt_handle_reg_handle_func(AMT_TABLE_PC, 254, serve_first), PUB_ERR_NONE);
    EXPECT_EQ(g_handle_context.m_handle_pc_func_a[254], &serve_first);
    for (const uint32_t id : {255U, 256U, 0xFFFFFFFFU}) {
        EXPECT_EQ(amt_handle_reg_handle_func(AMT_TABLE_PC, id, serve_first), PUB_ERR_PARAM);
        EXPECT_EQ(amt_handle_reg_handle_func(AMT_TABLE_APP, id, serve_first), PUB_ERR_PARAM);
    }
    expect_table(g_handle_context.m_handle_pc_func_a, {{254, serve_first}});
    expect_table(g_handle_context.m_handle_app_func_a, {});
    texts_t wanted(6, error_line("amt/amt-handle", "amt_handle_reg_handle_func", -101));
    wanted.insert(wanted.begin(), "PC register command id: 254(0xfe) - (undefined)");
    EXPECT_EQ(without_line_numbers(capture), wanted);
}

TEST_F(registry, every_table_but_the_first_is_the_apps)
{
    for (const int table : {2, 0, -1, 255}) {
        EXPECT_EQ(amt_handle_reg_handle_func(table, static_cast<uint32_t>(table & 0x3F), serve_first),
                  PUB_ERR_NONE);
    }
    expect_table(g_handle_context.m_handle_pc_func_a, {});
    expect_table(g_handle_context.m_handle_app_func_a,
                 {{2, serve_first}, {0, serve_first}, {63, serve_first}});
}

TEST_F(registry, replaces_a_handler)
{
    amt_handle_reg_handle_func(AMT_TABLE_PC, 9, serve_first);
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_reg_handle_func(AMT_TABLE_PC, 9, serve_second), PUB_ERR_NONE);
    EXPECT_EQ(g_handle_context.m_handle_pc_func_a[9], &serve_second);
    EXPECT_EQ(capture.texts(), (texts_t{"WARNING !", "re-register the handle function of request id: 9",
                                        "PC register command id: 9(0x09) - AMT_READ_BATTERY_CMD"}));
}

TEST_F(registry, clears_a_slot)
{
    amt_handle_reg_handle_func(AMT_TABLE_APP, 9, serve_first);
    {
        const log_capture_c capture;
        EXPECT_EQ(amt_handle_reg_handle_func(AMT_TABLE_APP, 9, nullptr), PUB_ERR_NONE);
        EXPECT_EQ(capture.texts(), (texts_t{"WARNING !", "clean the handle function of request id: 9",
                                            "WARNING !", "re-register the handle function of request id: 9",
                                            "APP register command id: 9(0x09) - AMT_READ_BATTERY_CMD"}));
    }
    expect_table(g_handle_context.m_handle_app_func_a, {});
    const log_capture_c capture;
    EXPECT_EQ(amt_handle_reg_handle_func(AMT_TABLE_APP, 9, nullptr), PUB_ERR_NONE);
    EXPECT_EQ(capture.texts(), (texts_t{"WARNING !", "clean the handle function of request id: 9",
                                        "APP register command id: 9(0x09) - AMT_READ_BATTERY_CMD"}));
}

} // namespace
