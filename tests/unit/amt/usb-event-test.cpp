#include "amt/amt-handle/reader/usb-event.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "amt/amt-handle/channel/context.h"
#include "tests/unit/support/log-capture.h"

namespace {

using texts_t = std::vector<std::string>;

const std::string LOOP = "amt_handle_monitor_usb_loop ";

/* Serves an event as the kernel sends it; returns what is logged, without the handshake's own lines. */
texts_t serve(const std::string &text)
{
    static amt_usb_event_st event;
    event = {};
    event.m_length = static_cast<uint32_t>(text.copy(event.m_text_a, AMT_USB_EVENT_SIZE));
    const log_capture_c capture;
    amt_usb_event_serve(event);
    texts_t own;
    for (const std::string &logged : capture.texts()) {
        if (logged.compare(0, LOOP.size(), LOOP) == 0) {
            own.push_back(logged.substr(LOOP.size()));
        }
    }
    return own;
}

class usb_event : public testing::Test {
protected:
    void SetUp() override
    {
        g_handle_state.m_usb_state = amt_usb_en::UNKNOWN;
    }
};

TEST_F(usb_event, first_string_that_tells_the_state_is_followed)
{
    EXPECT_EQ(serve(std::string("a@/b\0ACTION=change\0USB_STATE=CONFIGURED\0USB_STATE=DISCONNECTED\0", 63)),
              (texts_t{"uevent:[a@/b] nLen:63", "uevent:[ACTION=change] nLen:63",
                       "uevent:[USB_STATE=CONFIGURED] nLen:63", "usb_status:[USB_STATE=CONFIGURED]",
                       "get usb CONFIGURED event"}));
    EXPECT_EQ(g_handle_state.m_usb_state, amt_usb_en::CONFIGURED);
}

TEST_F(usb_event, disconnected_wins_within_a_string)
{
    EXPECT_EQ(serve("USB_STATE=CONFIGURED DISCONNECTED"),
              (texts_t{"uevent:[USB_STATE=CONFIGURED DISCONNECTED] nLen:33",
                       "usb_status:[USB_STATE=CONFIGURED DISCONNECTED]", "get usb disconnect event"}));
    EXPECT_EQ(g_handle_state.m_usb_state, amt_usb_en::DISCONNECTED);
}

TEST_F(usb_event, any_other_state_is_noted)
{
    EXPECT_EQ(serve("OLD_USB_STATE"), (texts_t{"uevent:[OLD_USB_STATE] nLen:13", "usb_status:[OLD_USB_STATE]",
                                               "get usb other status event"}));
    EXPECT_EQ(g_handle_state.m_usb_state, amt_usb_en::OTHER);
}

TEST_F(usb_event, strings_without_a_state_change_nothing)
{
    EXPECT_EQ(serve(std::string("\0STATE=DISCONNECTED\0\0", 21)),
              (texts_t{"uevent:[] nLen:21", "uevent:[STATE=DISCONNECTED] nLen:21", "uevent:[] nLen:21"}));
    EXPECT_EQ(g_handle_state.m_usb_state, amt_usb_en::UNKNOWN);
}

TEST_F(usb_event, largest_event_without_a_terminator_is_one_string)
{
    const std::string long_text(AMT_USB_EVENT_SIZE, 'x');
    EXPECT_EQ(serve(long_text), (texts_t{"uevent:[" + long_text + "] nLen:2048"}));
}

} // namespace
