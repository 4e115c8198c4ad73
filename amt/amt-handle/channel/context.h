#pragma once

#include <atomic>
#include <stdint.h>
#include <string_view>

#include "amt/amt-buf.h"
#include "amt/amt-handle/channel/worker.h"
#include "pub/pty/pty.h"

/* Command ids 0 to 254 have a handler slot. */
constexpr uint32_t AMT_HANDLE_FUNC_COUNT = 255;

/* Who tells the PC that its request has arrived. */
enum class amt_ack_en : uint8_t
{
    DISPATCHER, /* before it calls the handler */
    HANDLER     /* once it knows that the request is served here, if it is */
};

/*
 * The one hub record: threads, descriptors, buffers and handler tables. Zeroed at start-up before any thread
 * exists. A descriptor of 0 or less is closed. Each buffer belongs to the one reader thread that fills it.
 */
struct handle_context_st
{
    amt_worker_st m_app_reader;
    amt_worker_st m_pc_reader;
    amt_worker_st m_modem_reader;
    amt_worker_st m_usb_monitor;
    pub_pty_st m_pty;            /* the app's pseudo-terminal */
    std::atomic<int> m_fd_pc;    /* PC serial port */
    std::atomic<int> m_fd_at;    /* AT-mux tty of the modem: the AT command channel */
    std::atomic<int> m_fd_modem; /* modem data tty */
    amt_buf_st m_req;            /* what the PC or the app has sent; the two paths never run together */
    amt_buf_st m_rsp_pc;         /* responses to the PC */
    amt_buf_st m_rsp_app;        /* responses to the app */
    amt_buf_st m_modem;          /* what the modem has sent and the PC has not got yet */
    amt_buf_st m_pc;             /* the PC request without its envelope */
    amt_handle_func m_handle_pc_func_a[AMT_HANDLE_FUNC_COUNT];
    amt_handle_func m_handle_app_func_a[AMT_HANDLE_FUNC_COUNT];
    amt_ack_en m_pc_ack_a[AMT_HANDLE_FUNC_COUNT]; /* of the handlers in m_handle_pc_func_a */
};
extern handle_context_st g_handle_context;

/* What one read may hold at most: the byte behind it stays 0, so that text searches end inside the buffer. */
constexpr uint32_t AMT_HELD_SIZE = AMT_PACKET_SIZE - 1;

/* 1 when the daemon was started with -u: a USB-inserted start. Set before any thread exists, read-only
 * afterwards. */
extern int32_t g_usb_activate;

/* The manufacturing-test modes the hub can be in. The log shows the numbers. */
enum class amt_mode_en : int
{
    PC_PACKETS = 1, /* PC path, packets seen */
    APP = 3,        /* packet path running */
    PC_TEXT = 4     /* PC path, AT text seen */
};

/* States of the USB link. */
enum class amt_usb_en : uint8_t
{
    DISCONNECTED = 0,
    CONFIGURED = 1,
    OTHER = 2,
    UNKNOWN = 255
};

/* Process-wide state beside the context: small numbers that several threads touch. */
struct handle_state_st
{
    std::atomic<amt_mode_en> m_amt_mode;
    std::atomic<int> m_is_normal_mode; /* the argument of amt_handle_init, stored when init succeeded */
    std::atomic<int> m_is_no_modem;    /* 1 when the AT device could not be opened */
    std::atomic<amt_usb_en> m_usb_state;
};
extern handle_state_st g_handle_state;

/* Zeroes the whole context and its tables. Requires that no worker runs. */
void amt_handle_clear_context();

/* Zeroes a whole buffer. */
void amt_handle_clear_buf(amt_buf_st *buf_ptr);

/* All that the buffer holds as text, zero bytes included. */
std::string_view amt_handle_get_text(const amt_buf_st &buf);

/* Closes the descriptor if it is open (above 0) and marks it closed. Safe against two threads doing it at
 * once. */
void amt_handle_close_fd(std::atomic<int> *fd_ptr);
