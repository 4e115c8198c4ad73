#include <string.h>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/modem-tunnel.h"
#include "amt/amt-handle/request/modem-value.h"
#include "amt/amt-handle/request/test-result.h"
#include "amt/amt-handle/request/version.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"
#include "tests/unit/support/log-capture.h"

/* What must hold for every handler that waits for a final result, one row each. */
namespace {

const std::string OK = "\r\nOK\r\n";

struct kind_st
{
    const char *m_name_ptr;
    amt_handle_func m_handler;
    std::string m_request;
    std::string m_command;
    std::string m_answer; /* before the final result */
    std::string m_reply;
    uint8_t
        m_rsp_id; /* of the packet that answers a failure; 0 when the handler leaves that to the dispatcher */
    bool m_is_status_kept; /* the failing status is passed up as it is */
    int m_status_without_answer;
    std::string m_reply_without_answer;
};

std::string version_request(int32_t type)
{
    return wire_packet(45, int_atom(19, type));
}

/* Station numbers from 20 on keep the mirror file out of it. */
std::vector<kind_st> make_kinds()
{
    const std::string ok_atom = int_atom(1, 0);
    const std::string request = byte_atom(99, 1);
    const std::string tunnel_request = wire_packet(0x19, int_atom(5, 0x11223344) + byte_atom(6, 1));
    const std::string write_request =
        wire_packet(91, int_atom(39, 25) + int_atom(36, 2) + text_atom(37, "antenna"));
    const std::string read_reply = int_atom(39, 31) + int_atom(36, 1) + text_atom(37, "all good") + ok_atom;
    const std::string read_reply_without = int_atom(39, 30) + int_atom(36, 0) + text_atom(37, "") + ok_atom;
    return {
        {"tunnel", amt_modem_handle_req, tunnel_request, "AT^DTTEST=194433221101\r",
         "\r\n^DTTEST: 1A000000000000002A\r\n", wire_packet(0x1A, ok_atom + int_atom(13, 42)), 0, true,
         PUB_ERR_NONE, ""},
        {"version", handle_amt_req_version, version_request(17), "AT^DCMR=17\r",
         "\r\n^DCMR: 1,0D4142430A\r\n", wire_packet(46, int_atom(19, 17) + bytes_atom(18, "ABC") + ok_atom),
         0, false, PUB_ERR_FAIL, ""},
        {"write_result", amt_modem_write_test_result, write_request, "AT^DATOMW=25,2,antenna\r", "",
         wire_packet(92, ok_atom), 92, true, PUB_ERR_NONE, wire_packet(92, ok_atom)},
        {"read_result", amt_modem_read_test_result, wire_packet(89, int_atom(39, 30)), "AT^DATOMR=1,30\r",
         "\r\n^DATOMR: 31,1,all good\r\n", wire_packet(90, read_reply), 90, true, PUB_ERR_NONE,
         wire_packet(90, read_reply_without)},
        {"support", amt_query_amt_support, wire_packet(197, request), "AT^DMCC?\r", "\r\n^DMCC: 2,1,4,7\r\n",
         wire_packet(198, int_atom(202, 7) + ok_atom), 198, true, PUB_ERR_NONE, failure_packet(198)},
        {"serial", amt_read_serial_number, wire_packet(234, request), "AT^DMSN\r",
         "\r\n^DMSN: S0123456789\r\n", wire_packet(235, bytes_atom(163, "S0123456789") + ok_atom), 235, true,
         PUB_ERR_NONE, failure_packet(235)},
        {"sim", amt_dtoc_checkSIM, wire_packet(99, request), "AT^DTOC\r", "\r\n^DTOC: 2\r\n",
         wire_packet(100, byte_atom(41, 1)), 100, true, PUB_ERR_NONE, failure_packet(100)},
        {"board", amt_modem_handle_read_board, wire_packet(85, request), "AT^DMSN\r", "\r\n^DMSN: B-42\r\n",
         wire_packet(86, text_atom(38, "B-42") + ok_atom), 86, true, PUB_ERR_NONE, failure_packet(86)},
        {"outdate", amt_modem_handle_read_outdate, wire_packet(65, request), "AT^DMFD?\?\r",
         "\r\n^DMFD: 20130121\r\n", wire_packet(66, text_atom(27, "20130121") + ok_atom), 66, true,
         PUB_ERR_NONE, failure_packet(66)},
    };
}

const std::vector<kind_st> g_kinds = make_kinds();

std::vector<std::string> packets(const std::string &packet)
{
    return packet.empty() ? std::vector<std::string>() : std::vector<std::string>{packet};
}

/* A row of g_kinds, shown by its name. */
struct kind_row_st
{
    size_t m_index;
};

void PrintTo(const kind_row_st &row, std::ostream *out)
{
    *out << g_kinds[row.m_index].m_name_ptr;
}

std::vector<kind_row_st> all_rows()
{
    std::vector<kind_row_st> rows;
    for (size_t i = 0; i < g_kinds.size(); i++) {
        rows.push_back({i});
    }
    return rows;
}

class modem_kind : public testing::TestWithParam<kind_row_st> {
protected:
    const kind_st &kind() const
    {
        return g_kinds[GetParam().m_index];
    }

    /* Handles the request with the queued answer and expects this end of it. */
    void expect_end(const modem_line_c &line, int status, const std::string &reply) const
    {
        EXPECT_EQ(line.handle(kind().m_handler, kind().m_request), status);
        EXPECT_EQ(line.app_packets(), packets(reply));
        EXPECT_EQ(line.commands(), std::vector<std::string>{kind().m_command});
        EXPECT_EQ(line.pc_frames(), std::vector<std::string>());
    }

    void expect_success(const modem_line_c &line) const
    {
        expect_end(line, PUB_ERR_NONE, kind().m_reply);
    }

    /* Where a handler passes its failing status up it is this one. */
    void expect_failure(const modem_line_c &line, int status) const
    {
        if (kind().m_rsp_id != 0) {
            expect_end(line, PUB_ERR_NONE, failure_packet(kind().m_rsp_id));
        } else {
            expect_end(line, kind().m_is_status_kept ? status : PUB_ERR_FAIL, "");
        }
    }

    /* Runs check with the text in two chunks, split at every position. */
    template <typename check_func> void split_everywhere(const std::string &text, check_func check) const
    {
        for (size_t i = 1; i < text.size(); i++) {
            SCOPED_TRACE(i);
            const modem_line_c line;
            line.answer(text.substr(0, i));
            line.answer(text.substr(i));
            check(line);
            if (HasFailure()) {
                return;
            }
        }
    }
};

TEST_P(modem_kind, takes_an_answer_in_one_piece)
{
    const modem_line_c line;
    line.answer(kind().m_answer + OK);
    expect_success(line);
    EXPECT_EQ(line.unread_chunks(), 0U);
}

TEST_P(modem_kind, takes_an_answer_split_anywhere)
{
    split_everywhere(kind().m_answer + OK, [this](const modem_line_c &line) { expect_success(line); });
}

TEST_P(modem_kind, takes_an_answer_byte_by_byte)
{
    const modem_line_c line;
    line.answer_bytewise(kind().m_answer + OK);
    expect_success(line);
}

TEST_P(modem_kind, takes_an_answer_after_unsolicited_lines)
{
    const modem_line_c line;
    line.answer("\r\n+CREG: 1,\"00C3\"\r\n");
    line.answer("\r\n^DSIMST: 1\r\n\r\n+CSQ: 22,99\r\n" + kind().m_answer + OK);
    expect_success(line);
}

TEST_P(modem_kind, goes_on_when_the_modem_has_nothing_to_say)
{
    const modem_line_c line;
    line.answer(OK);
    expect_end(line, kind().m_status_without_answer, kind().m_reply_without_answer);
}

TEST_P(modem_kind, gives_up_on_every_error_result)
{
    for (const char *const error : {"\r\nERROR\r\n", "\r\n+CME ERROR: 100\r\n", "\r\n+CMS ERROR: 500\r\n"}) {
        SCOPED_TRACE(error);
        split_everywhere(error, [this](const modem_line_c &line) { expect_failure(line, PUB_ERR_FAIL); });
        const modem_line_c line;
        line.answer("\r\n+CREG: 1\r\n");
        line.answer(error);
        expect_failure(line, PUB_ERR_FAIL);
    }
}

TEST_P(modem_kind, is_not_misled_by_texts_that_only_begin_like_a_result)
{
    const modem_line_c line;
    line.answer("\r\nERRORS\r\n\r\n+CME\r\n ERROR");
    line.answer("\r\n+cme error: 1\r\n");
    line.answer(kind().m_answer + OK);
    expect_success(line);
}

TEST_P(modem_kind, ends_when_the_receive_area_is_full)
{
    const modem_line_c whole;
    whole.answer(std::string(4096, 'x'));
    whole.answer(OK);
    expect_failure(whole, PUB_ERR_PARAM);
    EXPECT_EQ(whole.unread_chunks(), 1U);
    const modem_line_c pieces;
    for (int i = 0; i < 4; i++) {
        pieces.answer(std::string(1024, '\n'));
    }
    expect_failure(pieces, PUB_ERR_PARAM);
}

TEST_P(modem_kind, takes_a_final_result_that_just_fits)
{
    const modem_line_c line;
    const std::string text = kind().m_answer + OK;
    line.answer(std::string(4096 - text.size(), 'x'));
    line.answer(text);
    expect_success(line);
}

TEST_P(modem_kind, survives_zero_bytes)
{
    const modem_line_c line;
    line.answer(std::string("\0\0\r\n\0", 5));
    line.answer(kind().m_answer + OK);
    expect_success(line);
}

TEST_P(modem_kind, fails_when_the_command_cannot_be_written)
{
    const modem_line_c line;
    line.close_at();
    const int status = line.handle(kind().m_handler, kind().m_request);
    EXPECT_EQ(status, kind().m_rsp_id != 0 ? PUB_ERR_NONE : PUB_ERR_FAIL);
    EXPECT_EQ(line.app_packets(), packets(kind().m_rsp_id != 0 ? failure_packet(kind().m_rsp_id) : ""));
}

TEST_P(modem_kind, fails_when_the_answer_cannot_be_read)
{
    modem_line_c line;
    line.break_reads();
    const int status = line.handle(kind().m_handler, kind().m_request);
    EXPECT_EQ(status, kind().m_rsp_id != 0 ? PUB_ERR_NONE : PUB_ERR_FAIL);
    EXPECT_EQ(line.app_packets(), packets(kind().m_rsp_id != 0 ? failure_packet(kind().m_rsp_id) : ""));
}

TEST_P(modem_kind, refuses_without_a_modem)
{
    const modem_line_c line;
    g_handle_state.m_is_no_modem = 1;
    const log_capture_c capture;
    EXPECT_EQ(line.handle(kind().m_handler, kind().m_request), PUB_ERR_NO_MODEM);
    EXPECT_NE(capture.texts().at(1).find("(), error_code=-111, errno="), std::string::npos);
    EXPECT_EQ(capture.texts().at(2), "WARNING !");
    EXPECT_EQ(capture.texts().at(3), "no CP.");
    EXPECT_EQ(line.commands().size() + line.app_packets().size(), 0U);
}

TEST_P(modem_kind, refuses_absent_arguments)
{
    const modem_line_c line;
    amt_buf_st req = {};
    amt_buf_st rsp = {};
    const log_capture_c capture;
    EXPECT_EQ(kind().m_handler(AMT_CHANNEL_APP, &req, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, 0, 1, 0");
    EXPECT_EQ(kind().m_handler(AMT_CHANNEL_APP, nullptr, &rsp), PUB_ERR_PARAM);
    req.m_buf_len = 6;
    EXPECT_EQ(kind().m_handler(AMT_CHANNEL_NONE, &req, &rsp), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "1, 0, 0, 0");
    EXPECT_EQ(kind().m_handler(AMT_CHANNEL_APP, &req, nullptr), PUB_ERR_PARAM);
    EXPECT_EQ(capture.texts().back(), "0, 0, 0, 1");
    EXPECT_EQ(line.commands().size() + line.app_packets().size(), 0U);
}

TEST_P(modem_kind, tells_when_its_answer_cannot_be_sent)
{
    const modem_line_c line;
    g_handle_context.m_pty.m_ptm_fd = 0;
    line.answer(kind().m_answer + OK);
    EXPECT_EQ(line.handle(kind().m_handler, kind().m_request), PUB_ERR_FAIL);
}

INSTANTIATE_TEST_SUITE_P(handlers, modem_kind, testing::ValuesIn(all_rows()),
                         [](const testing::TestParamInfo<kind_row_st> &param) {
                             return std::string(g_kinds[param.param.m_index].m_name_ptr);
                         });

} // namespace
