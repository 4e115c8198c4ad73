#include "amt/amt-handle/request/station-result.h"

#include <string_view>

#include "amt/amt-log.h"

namespace {

/* Takes a digit off the front of the text; -1, with the text unchanged, when there is none. */
int take_digit(std::string_view *text_ptr)
{
    if (text_ptr->empty() || text_ptr->front() < '0' || text_ptr->front() > '9') {
        return -1;
    }
    const int digit = text_ptr->front() - '0';
    text_ptr->remove_prefix(1);
    return digit;
}

bool take_comma(std::string_view *text_ptr)
{
    if (text_ptr->empty() || text_ptr->front() != ',') {
        return false;
    }
    text_ptr->remove_prefix(1);
    return true;
}

} // namespace

void amt_station_result_parse(const char *line, uint32_t length, amt_station_result_st *result_ptr)
{
    std::string_view rest(line, length);
    if (const int first = take_digit(&rest); first >= 0) {
        const int second = take_digit(&rest);
        result_ptr->m_station_num = second >= 0 ? first * 10 + second : first;
    }
    PUB_LOG(g_amt_handle_log, "amt_modem_read_test_result station_num[%d]", result_ptr->m_station_num);
    take_comma(&rest);
    if (const int verdict = take_digit(&rest); verdict >= 0) {
        result_ptr->m_verdict = verdict;
    }
    PUB_LOG(g_amt_handle_log, "amt_modem_read_test_result station_result[%d]", result_ptr->m_verdict);
    if (take_comma(&rest)) {
        const size_t count = rest.copy(result_ptr->m_description_a, AMT_ANSWER_DESCRIPTION_SIZE - 1);
        result_ptr->m_description_a[count] = '\0';
    }
    PUB_LOG(g_amt_handle_log, "amt_modem_read_test_result test_description_a[%s]",
            result_ptr->m_description_a);
}
