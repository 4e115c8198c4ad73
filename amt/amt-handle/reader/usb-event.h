#pragma once

#include <stdint.h>

/* The most that is taken of one event. */
constexpr uint32_t AMT_USB_EVENT_SIZE = 2048;

/* What the kernel sends: strings one after the other, each terminated; the last also when the kernel's is not. */
struct amt_usb_event_st
{
    uint32_t m_length; /* of all strings, their terminators included */
    char m_text_a[AMT_USB_EVENT_SIZE + 1];
};

/*
 * Looks for the first string that tells the USB state, and follows it: the state of the hub, and the handshake's
 * link. Each string up to there is logged. An event that tells nothing of it changes nothing.
 */
void amt_usb_event_serve(const amt_usb_event_st &event);
