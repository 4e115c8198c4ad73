#pragma once

#include <string>
#include <vector>

#include "amt/amt-buf.h"

/*
 * Stands at the far ends of the daemon's lines: the modem on the AT channel, the app and the PC. The lines
 * keep the borders of what is written, so that one chunk of an answer is one read of the code under test.
 * Answers are queued before the request is handled; a handler that waits for more than was queued ends the
 * test program after 30 seconds. One object at a time.
 */
class modem_line_c {
public:
    modem_line_c();
    ~modem_line_c();
    modem_line_c(const modem_line_c &) = delete;
    modem_line_c &operator=(const modem_line_c &) = delete;

    /* Queues a chunk of the modem's answer. */
    void answer(const std::string &chunk) const;

    /* Queues an answer in chunks of one byte. */
    void answer_bytewise(const std::string &text) const;

    /* What the modem has got, write by write. */
    std::vector<std::string> commands() const;

    /* What the app and the PC have got, write by write. */
    std::vector<std::string> app_packets() const;
    std::vector<std::string> pc_frames() const;

    /* How many queued chunks nobody has read yet. They are taken out of the queue. */
    size_t unread_chunks() const;

    /* Has a handler serve a packet, with a response buffer that holds the rest of an unsent response. */
    int handle(amt_handle_func handler, const std::string &packet, uint32_t channel = AMT_CHANNEL_APP) const;

    /* Makes the AT channel one that swallows commands, and fails when it is read. */
    void break_reads();

    /* Makes the AT channel one that fails at once. */
    void close_at() const;

private:
    int m_modem_a[2];
    int m_app_a[2];
    int m_pc_a[2];
    int m_unreadable_fd;
};

/* The wire, written down a second time. */
std::string int_atom(uint8_t id, int32_t value);
std::string text_atom(uint8_t id, const std::string &text);
std::string bytes_atom(uint8_t id, const std::string &bytes);
std::string byte_atom(uint8_t id, uint8_t value);
std::string wire_packet(uint8_t id, const std::string &atoms);

/* The packet that answers a failed request. */
std::string failure_packet(uint8_t rsp_id);
