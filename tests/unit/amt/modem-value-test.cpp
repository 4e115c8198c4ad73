#include "amt/amt-handle/request/modem-value.h"

#include <algorithm>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <thread>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-lines.h"
#include "tests/unit/support/temp-folder.h"

namespace {

using namespace std::string_literals;

const std::string OK = "\r\nOK\r\n";
constexpr const char *TEMPERATURE_PATH = "sys/class/power_supply/battery/temp";

/* Serves the request of that id with the modem's answer line and returns the app's packets. */
std::vector<std::string> ask(amt_handle_func handler, uint8_t id, const std::string &answer)
{
    const modem_line_c line;
    line.answer("\r\n" + answer + "\r\n" + OK);
    EXPECT_EQ(line.handle(handler, wire_packet(id, byte_atom(99, 1))), PUB_ERR_NONE);
    return line.app_packets();
}

TEST(board_number, takes_38_characters_and_refuses_39)
{
    for (const size_t size : {0U, 37U, 38U}) {
        const std::string board(size, 'B');
        EXPECT_EQ(ask(amt_modem_handle_read_board, 85, "^DMSN: " + board),
                  std::vector<std::string>{wire_packet(86, text_atom(38, board) + int_atom(1, 0))});
    }
    EXPECT_EQ(ask(amt_modem_handle_read_board, 85, "^DMSN: " + std::string(39, 'B')),
              std::vector<std::string>{failure_packet(86)});
}

TEST(board_number, may_begin_with_any_byte)
{
    EXPECT_EQ(ask(amt_modem_handle_read_board, 85, "^DMSN: \xFF\xFF"),
              std::vector<std::string>{wire_packet(86, text_atom(38, "\xFF\xFF") + int_atom(1, 0))});
}

TEST(outdate, takes_14_characters_and_refuses_15)
{
    for (const size_t size : {0U, 13U, 14U}) {
        const std::string date(size, '3');
        EXPECT_EQ(ask(amt_modem_handle_read_outdate, 65, "^DMFD: " + date),
                  std::vector<std::string>{wire_packet(66, text_atom(27, date) + int_atom(1, 0))});
    }
    EXPECT_EQ(ask(amt_modem_handle_read_outdate, 65, "^DMFD: " + std::string(15, '3')),
              std::vector<std::string>{failure_packet(66)});
}

TEST(outdate, an_erased_record_is_a_failure)
{
    EXPECT_EQ(ask(amt_modem_handle_read_outdate, 65, "^DMFD: \xFF"),
              std::vector<std::string>{failure_packet(66)});
    EXPECT_EQ(ask(amt_modem_handle_read_outdate, 65,
                  "^DMFD: \xFF"
                  "0130121"),
              std::vector<std::string>{failure_packet(66)});
    EXPECT_EQ(ask(amt_modem_handle_read_outdate, 65, "^DMFD: 2\xFF"),
              std::vector<std::string>{wire_packet(66, text_atom(27, "2\xFF") + int_atom(1, 0))});
}

/* The driver's file is found from the working directory. */
class temperature : public testing::Test {
protected:
    void SetUp() override
    {
        ASSERT_NE(getcwd(m_old_a, sizeof(m_old_a)), nullptr);
        ASSERT_EQ(chdir(m_folder.path("").c_str()), 0);
        for (const char *const folder :
             {"sys", "sys/class", "sys/class/power_supply", "sys/class/power_supply/battery"})
        {
            ASSERT_EQ(mkdir(folder, 0700), 0);
        }
    }

    void TearDown() override
    {
        EXPECT_EQ(chdir(m_old_a), 0);
    }

    std::vector<std::string> ask_with(const std::string &content) const
    {
        write_whole_file(TEMPERATURE_PATH, content);
        EXPECT_EQ(m_line.handle(amt_modem_handle_temperature, wire_packet(55, byte_atom(99, 1))),
                  PUB_ERR_NONE);
        return m_line.app_packets();
    }

    static std::vector<std::string> reply(int32_t number)
    {
        return {wire_packet(56, int_atom(22, number) + int_atom(1, 0))};
    }

    temp_folder_c m_folder;
    modem_line_c m_line;
    char m_old_a[4096] = {};
};

TEST_F(temperature, is_what_the_driver_says)
{
    const log_capture_c capture;
    EXPECT_EQ(ask_with("315\n"), reply(315));
    EXPECT_TRUE(capture.has("Battery temperature: 315"));
    EXPECT_EQ(ask_with("  0"), reply(0));
    EXPECT_EQ(ask_with("-20\n"), reply(-20));
    EXPECT_TRUE(m_line.commands().empty());
}

TEST_F(temperature, needs_no_modem)
{
    g_handle_state.m_is_no_modem = 1;
    EXPECT_EQ(ask_with("315\n"), reply(315));
}

TEST_F(temperature, without_a_number_is_a_failure)
{
    for (const char *const content : {"", "\n", "cold\n"}) {
        const log_capture_c capture;
        EXPECT_EQ(ask_with(content), std::vector<std::string>{failure_packet(56)});
        EXPECT_TRUE(capture.has("fscanf error: errno=0"));
    }
}

TEST_F(temperature, without_a_file_is_a_failure)
{
    const log_capture_c capture;
    EXPECT_EQ(m_line.handle(amt_modem_handle_temperature, wire_packet(55, "")), PUB_ERR_NONE);
    EXPECT_EQ(m_line.app_packets(), std::vector<std::string>{failure_packet(56)});
    const std::vector<std::string> texts = without_line_numbers(capture);
    const auto failure = std::find(texts.begin(), texts.end(), "fopen error: errno=2");
    ASSERT_TRUE(failure != texts.begin() && failure != texts.end());
    EXPECT_EQ(*std::prev(failure),
              error_line("amt/amt-handle", "amt_modem_handle_temperature", PUB_ERR_FILE, ENOENT));
}

/* The end of a thread runs no destructors, and strikes where it waits: for the app that does not read, too. */
TEST_F(temperature, closes_the_file_before_it_waits_for_the_reader_of_the_answer)
{
    const int app_fd = g_handle_context.m_pty.m_ptm_fd;
    size_t waiting_count = 0;
    while (send(app_fd, "x", 1, MSG_DONTWAIT) == 1) {
        waiting_count++;
    }
    ASSERT_EQ(mkfifo(TEMPERATURE_PATH, 0600), 0);
    std::thread handler([this] {
        EXPECT_EQ(m_line.handle(amt_modem_handle_temperature, wire_packet(55, "")), PUB_ERR_NONE);
    });
    const int driver_fd = open(TEMPERATURE_PATH, O_WRONLY);
    EXPECT_EQ(write(driver_fd, "315\n", 4), 4);
    pollfd reader_gone = {driver_fd, 0, 0};
    EXPECT_EQ(poll(&reader_gone, 1, 20000), 1);
    std::vector<std::string> packets;
    while (packets.size() < waiting_count + 1) {
        for (const std::string &packet : m_line.app_packets()) {
            packets.push_back(packet);
        }
    }
    handler.join();
    EXPECT_EQ(packets.back(), reply(315).front());
    close(driver_fd);
}

TEST_F(temperature, leaves_no_descriptor_open)
{
    ask_with("315\n");
    const int before = dup(STDIN_FILENO);
    close(before);
    for (int i = 0; i < 20; i++) {
        ask_with(i % 2 == 0 ? "315\n" : "cold\n");
    }
    const int after = dup(STDIN_FILENO);
    close(after);
    EXPECT_EQ(after, before);
}

TEST_F(temperature, checks_its_arguments)
{
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    EXPECT_EQ(amt_modem_handle_temperature(AMT_CHANNEL_APP, &req, &rsp), PUB_ERR_PARAM);
    req.m_buf_len = 6;
    EXPECT_EQ(amt_modem_handle_temperature(AMT_CHANNEL_NONE, &req, &rsp), PUB_ERR_PARAM);
}

std::string switch_request(int32_t channel)
{
    return wire_packet(232, int_atom(159, channel));
}

TEST(channel_switch, sends_exactly_12_bytes)
{
    const std::pair<int32_t, const char *> row_a[] = {
        {1, "AT^DMPCHN=1\r"}, {0, "AT^DMPCHN=0\r"},        {9, "AT^DMPCHN=9\r"},       {10, "AT^DMPCHN=10"},
        {-1, "AT^DMPCHN=-1"}, {INT32_MAX, "AT^DMPCHN=21"}, {INT32_MIN, "AT^DMPCHN=-2"}};
    for (const auto &[channel, command] : row_a) {
        const modem_line_c line;
        line.answer(OK);
        EXPECT_EQ(line.handle(amt_channel_switch, switch_request(channel)), PUB_ERR_NONE);
        EXPECT_EQ(line.commands(), std::vector<std::string>{command});
        EXPECT_EQ(line.app_packets(), std::vector<std::string>{wire_packet(233, int_atom(1, 0))});
    }
    const modem_line_c line;
    line.answer(OK);
    EXPECT_EQ(line.handle(amt_channel_switch, wire_packet(232, "")), PUB_ERR_NONE);
    EXPECT_EQ(line.commands(), std::vector<std::string>{"AT^DMPCHN=0\r"});
}

TEST(channel_switch, wraps_its_answer_for_the_pc)
{
    const modem_line_c line;
    line.answer("OK");
    EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1), AMT_CHANNEL_PC), PUB_ERR_NONE);
    const std::vector<std::string> frames = line.pc_frames();
    ASSERT_EQ(frames.size(), 1U);
    EXPECT_EQ(frames[0].substr(12, 15), wire_packet(233, int_atom(1, 0)));
    EXPECT_EQ(frames[0].size(), 15U + 16U);
}

TEST(channel_switch, takes_a_single_answer)
{
    for (const std::string answer : {"\r\nERROR\r\n", "\r\nO", "x"}) {
        const modem_line_c line;
        line.answer(answer);
        line.answer(OK);
        const log_capture_c capture;
        EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1)), PUB_ERR_FAIL);
        EXPECT_EQ(capture.texts().back(), answer);
        EXPECT_TRUE(line.app_packets().empty());
        EXPECT_EQ(line.unread_chunks(), 1U);
    }
}

TEST(channel_switch, reads_100_bytes_at_most)
{
    const modem_line_c line;
    line.answer(std::string(98, 'x') + "OK");
    EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1)), PUB_ERR_NONE);
    line.answer(std::string(99, 'x') + "OK");
    EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1)), PUB_ERR_FAIL);
}

TEST(channel_switch, passes_failures_up)
{
    modem_line_c line;
    line.break_reads();
    EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1)), PUB_ERR_FAIL);
    line.close_at();
    EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1)), PUB_ERR_FAIL);
    g_handle_state.m_is_no_modem = 1;
    EXPECT_EQ(line.handle(amt_channel_switch, switch_request(1)), PUB_ERR_NO_MODEM);
    EXPECT_TRUE(line.app_packets().empty());
}

std::vector<std::string> ask_support(const std::string &value)
{
    return ask(amt_query_amt_support, 197, "^DMCC: " + value);
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
        EXPECT_EQ(capture.count_containing("FUNC-amt_query_amt_support(), error_code=-100, "), 1);
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
        EXPECT_EQ(ask(amt_read_serial_number, 234, "^DMSN:" + serial),
                  std::vector<std::string>{wire_packet(235, bytes_atom(163, serial) + int_atom(1, 0))});
    }
    for (const size_t size : {39U, 40U, 4000U}) {
        EXPECT_EQ(ask(amt_read_serial_number, 234, "^DMSN:" + std::string(size, 'S')),
                  std::vector<std::string>{failure_packet(235)});
    }
}

TEST(serial_number, traces_its_parse)
{
    const log_capture_c capture;
    ask(amt_read_serial_number, 234, "^DMSN: S12");
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
        EXPECT_EQ(ask(amt_dtoc_checkSIM, 99, "^DTOC: "s + value),
                  std::vector<std::string>{wire_packet(100, byte_atom(41, flag))});
    }
    EXPECT_EQ(ask(amt_dtoc_checkSIM, 99, "^DTOC: 1" + std::string(38, ' ')),
              std::vector<std::string>{failure_packet(100)});
}

TEST(sim_check, traces_its_parse)
{
    const log_capture_c capture;
    ask(amt_dtoc_checkSIM, 99, "^DTOC: 2");
    EXPECT_TRUE(capture.has("amt_dtoc_checkSIM head_ptr=\r\n^DTOC: 2\r\n\r\nOK\r\n"));
    EXPECT_TRUE(capture.has("amt_dtoc_checkSIM board_a=2"));
    EXPECT_TRUE(capture.has("amt_dtoc_checkSIM simtype=2"));
}

} // namespace
