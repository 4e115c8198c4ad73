#include "amt/amt-handle/request/modem-check.h"

#include <gtest/gtest.h>

#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

namespace {

const std::string OK = "\r\nOK\r\n";

/* Serves the request of that id with the value behind the prefix and returns the app's packets. */
std::vector<std::string> ask(amt_handle_func handler, uint8_t id, const std::string &prefix,
                             const std::string &value)
{
    const modem_line_c line;
    line.answer("\r\n" + prefix + value + "\r\n" + OK);
    EXPECT_EQ(line.handle(handler, wire_packet(id, byte_atom(99, 1))), PUB_ERR_NONE);
    return line.app_packets();
}

std::vector<std::string> ask_support(const std::string &value)
{
    return ask(amt_query_amt_support, 197, "^DMCC: ", value);
}

std::vector<std::string> support_reply(int32_t rat)
{
    return {wire_packet(198, int_atom(202, rat) + int_atom(1, 0))};
}

TEST(amt_support, reads_the_fourth_field)
{
    EXPECT_EQ(ask_support("2,1,4,7"), support_reply(7));
    EXPECT_EQ(ask_support("2,1,4,-7,9"), support_reply(-7));
    EXPECT_EQ(ask_support("a,b,c,x"), support_reply(0));
    EXPECT_EQ(ask_support("2,1,4, 12abc"), support_reply(12));
}

TEST(amt_support, empty_fields_do_not_count)
{
    EXPECT_EQ(ask_support(",,2,,1,4,,7"), support_reply(7));
    EXPECT_EQ(ask_support("2,,4,7"), std::vector<std::string>{failure_packet(198)});
}

TEST(amt_support, keeps_a_number_in_range)
{
    EXPECT_EQ(ask_support("2,1,4,99999999999999999999"), support_reply(INT32_MAX));
    EXPECT_EQ(ask_support("2,1,4,-99999999999999999999"), support_reply(INT32_MIN));
}

TEST(amt_support, names_the_missing_field)
{
    const std::pair<const char *, const char *> row_a[] = {{"", "sim_num is null!!!"},
                                                           {"2", "standby_num is null!!!"},
                                                           {"2,1", "rf_set_num is null!!!"},
                                                           {"2,1,4", "standby0_rat is null!!!"},
                                                           {"2,1,4,", "standby0_rat is null!!!"}};
    for (const auto &[value, expected] : row_a) {
        const log_capture_c capture;
        EXPECT_EQ(ask_support(value), std::vector<std::string>{failure_packet(198)});
        EXPECT_EQ(capture.count_containing(" is null!!!"), 1);
        EXPECT_TRUE(capture.has(expected));
    }
}

TEST(amt_support, takes_38_characters_and_refuses_39)
{
    const std::string fields = "2,1,4,7";
    EXPECT_EQ(ask_support(fields + std::string(31, ' ')), support_reply(7));
    const log_capture_c capture;
    EXPECT_EQ(ask_support(fields + std::string(32, ' ')), std::vector<std::string>{failure_packet(198)});
    EXPECT_TRUE(capture.has("getted nstandby0_rat:7."));
}

TEST(amt_support, traces_its_parse)
{
    const log_capture_c capture;
    ask_support("2,1,4,7");
    EXPECT_TRUE(capture.has("amt_query_amt_support :\r\n^DMCC: 2,1,4,7\r\n\r\nOK\r\n"));
    EXPECT_TRUE(capture.has("amt_query_amt_support head_ptr=\r\n^DMCC: 2,1,4,7\r\n\r\nOK\r\n"));
    EXPECT_TRUE(capture.has("amt_query_amt_support parameter=2,1,4,7"));
    EXPECT_TRUE(capture.has("getted nstandby0_rat:7."));
}

TEST(serial_number, takes_38_characters_and_refuses_39)
{
    for (const size_t size : {0U, 1U, 37U, 38U}) {
        const std::string serial(size, 'S');
        EXPECT_EQ(ask(amt_read_serial_number, 234, "^DMSN:", serial),
                  std::vector<std::string>{wire_packet(235, bytes_atom(163, serial) + int_atom(1, 0))});
    }
    for (const size_t size : {39U, 40U, 4000U}) {
        EXPECT_EQ(ask(amt_read_serial_number, 234, "^DMSN:", std::string(size, 'S')),
                  std::vector<std::string>{failure_packet(235)});
    }
}

TEST(serial_number, traces_its_parse)
{
    const log_capture_c capture;
    ask(amt_read_serial_number, 234, "^DMSN: ", "S12");
    EXPECT_TRUE(capture.has("amt_read_serial_number :\r\n^DMSN: S12\r\n\r\nOK\r\n"));
    EXPECT_TRUE(capture.has("amt_read_serial_number head_ptr=\r\n^DMSN: S12\r\n\r\nOK\r\n"));
    EXPECT_TRUE(capture.has("amt_read_serial_number serial_number=S12"));
    EXPECT_TRUE(capture.has("get serial-number success. serial-number:[len:3 content:S12]"));
}

TEST(sim_check, knows_types_1_and_2)
{
    const std::pair<const char *, uint8_t> row_a[] = {{"1", 1},  {"2", 1},         {"0", 0},  {"3", 0},
                                                      {"", 0},   {"12", 0},        {"-1", 0}, {"1x", 1},
                                                      {"x1", 0}, {"4294967297", 0}};
    for (const auto &[value, flag] : row_a) {
        SCOPED_TRACE(value);
        EXPECT_EQ(ask(amt_dtoc_checkSIM, 99, "^DTOC: ", value),
                  std::vector<std::string>{wire_packet(100, byte_atom(41, flag))});
    }
    EXPECT_EQ(ask(amt_dtoc_checkSIM, 99, "^DTOC: ", "1" + std::string(38, ' ')),
              std::vector<std::string>{failure_packet(100)});
}

TEST(sim_check, traces_its_parse)
{
    const log_capture_c capture;
    ask(amt_dtoc_checkSIM, 99, "^DTOC: ", "2");
    EXPECT_TRUE(capture.has("amt_dtoc_checkSIM head_ptr=\r\n^DTOC: 2\r\n\r\nOK\r\n"));
    EXPECT_TRUE(capture.has("amt_dtoc_checkSIM board_a=2"));
    EXPECT_TRUE(capture.has("amt_dtoc_checkSIM simtype=2"));
}

} // namespace
