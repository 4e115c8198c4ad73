#include "amt/amt-handle/at/at-handler.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/amt-device/radio-library.h"
#include "tests/unit/amt/modem-line.h"

namespace {

using texts_t = std::vector<std::string>;

/* The station has said text. */
void hold(const std::string &text)
{
    amt_handle_clear_buf(&g_handle_context.m_req);
    g_handle_context.m_req.m_buf_len =
        static_cast<uint32_t>(text.copy(reinterpret_cast<char *>(g_handle_context.m_req.m_buf_a), 4095));
}

TEST(at_radio, a_number_has_at_most_20_characters)
{
    const modem_line_c line;
    radio_library_c library;
    for (const size_t zeros : {1U, 19U, 20U, 21U, 300U}) {
        hold("AT^DBTCTRL=" + std::string(zeros - 1, '0') + "1\r");
        EXPECT_EQ(amt_at_control_bt(nullptr), PUB_ERR_NONE);
        EXPECT_EQ(library.take_calls(), texts_t{zeros <= 20 ? "ldt_btCtrl(1)" : "ldt_btCtrl(0)"});
        EXPECT_EQ(line.pc_frames(), texts_t{"\r\nOK\r\n"});
    }
    amt_handle_clear_buf(&g_handle_context.m_req);
}

TEST(at_radio, no_number_is_no_state)
{
    const modem_line_c line;
    radio_library_c library;
    for (const char *const text : {"AT^DBTCTRL=\r", "AT^DBTCTRL\r", ""}) {
        hold(text);
        EXPECT_EQ(amt_at_control_bt(nullptr), PUB_ERR_NONE);
        EXPECT_EQ(amt_at_check_device(nullptr), PUB_ERR_NONE);
        EXPECT_EQ(library.take_calls(), texts_t{});
        EXPECT_EQ(line.pc_frames(), (texts_t{"\r\nERROR\r\n", "\r\nERROR\r\n"}));
    }
    amt_handle_clear_buf(&g_handle_context.m_req);
}

} // namespace
