#include "amt/amt-handle/request/test-result.h"

#include <string_view>

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-handle/channel/at-exchange.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/result-file.h"
#include "amt/amt-handle/request/station-result.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "pub/log/print.h"

namespace {

constexpr int32_t VERDICT_MAX = 2;
constexpr const char *PROGRAM = "vx-kel-amt";

int read_answer(void *context);

constexpr amt_at_exchange_st g_write_exchange = {"amt_modem_write_test_result", amt_at_trace_en::STATUS,
                                                 AMT_AT_OK, false, nullptr};
constexpr amt_at_exchange_st g_read_exchange = {"amt_modem_read_test_result", amt_at_trace_en::STATUS,
                                                AMT_AT_OK, true, read_answer};

/* Stores what the modem keeps in the factory file too. Whether that works is logged and changes nothing else.
 */
void mirror_verdict(int32_t station_num, int32_t verdict, bool is_status_logged, int line = __builtin_LINE())
{
    const int status = saveAmtResult(station_num, verdict);
    if (status == PUB_ERR_NONE) {
        PUB_LOG(g_amt_handle_log, "write amt_result success amt station_num: %d, station_result: %d.\n",
                station_num, verdict);
    } else if (is_status_logged) {
        PUB_LOG(g_amt_handle_log, "[%s:L%d] write fail amt station_num: %d, station_result: %d. rtn:%d.\n",
                PROGRAM, line, station_num, verdict, status);
    } else {
        PUB_LOG(g_amt_handle_log, "[%s:L%d] write fail amt station_num: %d, station_result: %d\n", PROGRAM,
                line, station_num, verdict);
    }
}

/* Reads the answer line again after each read, as far as it has come. */
int read_answer(void *context)
{
    constexpr std::string_view prefix = "\r\n^DATOMR: ";
    const std::string_view received = amt_at_received();
    const size_t head = received.find(prefix);
    PUB_LOG(g_amt_handle_log, "amt_modem_read_test_result head_ptr[%s]",
            head == std::string_view::npos ? "(null)" : received.data() + head);
    if (head == std::string_view::npos) {
        return PUB_ERR_NONE;
    }
    const size_t start = head + prefix.size();
    const size_t end = received.find("\r\n", start);
    if (end != std::string_view::npos) {
        amt_station_result_parse(received.data() + start, static_cast<uint32_t>(end - start),
                                 static_cast<amt_station_result_st *>(context));
    }
    return PUB_ERR_NONE;
}

/* Shows a command about to be sent. */
void log_command(const char *name = __builtin_FUNCTION())
{
    PUB_LOG(g_amt_handle_log, "%s m_buf_a[%s] m_buf_len[%d]", name, g_at_transmit.m_text_a,
            static_cast<int>(g_at_transmit.m_len));
}

} // namespace

int amt_modem_write_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter_modem(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const uint8_t *const packet = req_ptr->m_buf_a;
    const int32_t station_num = amt_packet_get_int(packet, AMT_ATOM_STATION);
    const int32_t verdict = amt_packet_get_int(packet, AMT_ATOM_VERDICT);
    char description_a[AMT_REQUEST_DESCRIPTION_SIZE] = {};
    amt_packet_get_string(packet, AMT_ATOM_DESCRIPTION, description_a, sizeof(description_a));
    description_a[sizeof(description_a) - 1] = '\0';
    mirror_verdict(station_num, verdict, false);
    if (description_a[0] != '\0') {
        amt_at_set_command("AT^DATOMW=%d,%d,%s\r", station_num, verdict, description_a);
    } else {
        amt_at_set_command("AT^DATOMW=%d,%d\r", station_num, verdict);
    }
    log_command();
    status = amt_at_exchange(g_write_exchange, nullptr);
    PUB_LOG(g_amt_handle_log, "amt_modem_write_test_result\tret_val[%d]", status);
    return status == PUB_ERR_NONE ? amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_WRITE_TEST_RESULT_RSPCMD)
                                  : amt_reply_fail(channel, rsp_ptr, AMT_WRITE_TEST_RESULT_RSPCMD);
}

int amt_modem_read_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter_modem(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    amt_station_result_st result = {};
    result.m_station_num = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_STATION);
    amt_at_set_command("AT^DATOMR=1,%d\r", result.m_station_num);
    log_command();
    status = amt_at_exchange(g_read_exchange, &result);
    PUB_LOG(g_amt_handle_log, "amt_modem_read_test_result ret_val[%d] station_num[%d] station_result[%d]",
            status, result.m_station_num, result.m_verdict);
    if (status != PUB_ERR_NONE) {
        return amt_reply_fail(channel, rsp_ptr, AMT_READ_TEST_RESULT_RSPCMD);
    }
    mirror_verdict(result.m_station_num, result.m_verdict, true);
    amt_reply_start(rsp_ptr, AMT_READ_TEST_RESULT_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_STATION, result.m_station_num);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_VERDICT, result.m_verdict);
    amt_packet_add_string(rsp_ptr->m_buf_a, AMT_ATOM_DESCRIPTION, result.m_description_a);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int amt_modem_write_pc_test_result(uint32_t, amt_buf_st *req_ptr, amt_buf_st *)
{
    pub_log_entry(g_amt_handle_log);
    const int32_t station_num = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_STATION);
    const int32_t verdict = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_VERDICT);
    PUB_LOG(g_amt_handle_log, "amt_modem_write_pc_test_result station_num=%d,station_result=%d", station_num,
            verdict);
    mirror_verdict(station_num, verdict, false);
    return PUB_ERR_NOT_FOUND;
}

int amt_item_write_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const int32_t station_num = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_STATION);
    const int32_t verdict = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_VERDICT);
    PUB_LOG(g_amt_handle_log, "amt_item_write_test_result station_num[%d] station_result[%d]", station_num,
            verdict);
    /* The item before the number is written; the read below takes the number itself. Wraps as a 32-bit number
     * does. */
    if (saveProductResult(static_cast<int32_t>(static_cast<uint32_t>(station_num) - 1U), verdict) !=
        PUB_ERR_NONE) {
        status = PUB_ERR_INCOMPLETE;
        pub_log_error(g_amt_handle_log, status);
        pub_print("[%s:L%d] write fail station_num: %d, station_result: %d\n", PROGRAM, __LINE__, station_num,
                  verdict);
    }
    PUB_LOG(g_amt_handle_log, "amt_item_write_test_result write_item ret_val[%d]", status);
    return status == PUB_ERR_NONE ? amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_WRITE_ITEM_RESULT_RSPCMD)
                                  : amt_reply_fail(channel, rsp_ptr, AMT_WRITE_ITEM_RESULT_RSPCMD);
}

int amt_item_read_test_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const int32_t station_num = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_STATION);
    const int verdict = readProductResult(station_num);
    PUB_LOG(g_amt_handle_log, "amt_item_read_test_result station_num[%d] station_result[%d]", station_num,
            verdict);
    status = verdict < 0 || verdict > VERDICT_MAX ? PUB_ERR_NOT_FOUND : PUB_ERR_NONE;
    if (status != PUB_ERR_NONE) {
        pub_log_error(g_amt_handle_log, status);
    }
    PUB_LOG(g_amt_handle_log, "amt_item_read_test_result read_item ret_val[%d]", status);
    if (status != PUB_ERR_NONE) {
        return amt_reply_fail(channel, rsp_ptr, AMT_READ_ITEM_RESULT_RSPCMD);
    }
    amt_reply_start(rsp_ptr, AMT_READ_ITEM_RESULT_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_STATION, station_num);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_VERDICT, verdict);
    return amt_reply_finish_ok(channel, rsp_ptr);
}
