#include "amt/amt-handle/at/at-handler.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "pub/error.h"
#include "tests/unit/amt/modem-line.h"

namespace {

using texts_t = std::vector<std::string>;

TEST(at_reply, results_have_fixed_texts)
{
    const modem_line_c line;
    EXPECT_EQ(amt_at_reply_ok(), PUB_ERR_NONE);
    EXPECT_EQ(amt_at_reply_error(), PUB_ERR_NONE);
    EXPECT_EQ(amt_at_reply_cme(), PUB_ERR_NONE);
    EXPECT_EQ(line.pc_frames(), (texts_t{"\r\nOK\r\n", "\r\nERROR\r\n", "\r\n+CME ERROR: 100\r\n"}));
    EXPECT_EQ(line.app_packets(), texts_t{});
}

TEST(at_reply, has_at_most_4095_characters)
{
    const modem_line_c line;
    for (const size_t size : {1U, 4094U, 4095U, 4096U, 9000U}) {
        const std::string text(size, 'r');
        EXPECT_EQ(amt_at_reply("%s", text.c_str()), PUB_ERR_NONE);
        EXPECT_EQ(line.pc_frames(), texts_t{text.substr(0, 4095)});
    }
}

TEST(at_reply, without_a_line_is_the_senders_failure)
{
    const modem_line_c line;
    g_handle_context.m_fd_pc = -1;
    EXPECT_EQ(amt_at_reply_ok(), PUB_ERR_FAIL);
    /* Nothing to say is no reply. */
    EXPECT_EQ(amt_at_reply("%s", ""), PUB_ERR_PARAM);
}

} // namespace
