#include <memory>
#include <string>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/reader/usb-event.h"
#include "tests/fuzz/support/input.h"

/*
 * The input is a run of kernel events: 2 bytes of length in front of each, as the socket hands them over, its last
 * string terminated or not. What a record leaves behind it is the next one's to write over.
 */
namespace {

constexpr size_t MOST_EVENTS = 16;

/* The state after an event, told from the text once more and in another way. */
amt_usb_en state_after(const std::string &text, amt_usb_en before)
{
    for (size_t start = 0; start < text.size();) {
        const std::string one(text.c_str() + start);
        if (one.find("USB_STATE") != std::string::npos) {
            if (one.find("DISCONNECTED") != std::string::npos) {
                return amt_usb_en::DISCONNECTED;
            }
            return one.find("CONFIGURED") != std::string::npos ? amt_usb_en::CONFIGURED : amt_usb_en::OTHER;
        }
        start += one.size() + 1;
    }
    return before;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    fuzz_input_c input(data, size);
    const auto event_ptr = std::make_unique<amt_usb_event_st>();
    g_usb_activate = 0;
    g_handle_state.m_usb_state = amt_usb_en::UNKNOWN;
    for (size_t i = 0; i < MOST_EVENTS; i++) {
        const std::vector<uint8_t> taken = input.take(input.take_u16() % (AMT_USB_EVENT_SIZE + 1));
        if (taken.empty()) {
            break;
        }
        const std::string text(taken.begin(), taken.end());
        text.copy(event_ptr->m_text_a, text.size());
        event_ptr->m_text_a[text.size()] = '\0';
        event_ptr->m_length = static_cast<uint32_t>(text.size());
        const amt_usb_en wanted = state_after(text, g_handle_state.m_usb_state);
        amt_usb_event_serve(*event_ptr);
        FUZZ_REQUIRE(g_handle_state.m_usb_state == wanted);
        FUZZ_REQUIRE(memcmp(event_ptr->m_text_a, text.data(), text.size()) == 0);
    }
    return 0;
}
