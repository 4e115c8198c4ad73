#pragma once

#include <stdint.h>
#include <sys/types.h>

#include "amt/amt-buf.h"
#include "amt/amt-handle/channel/worker.h"

/*
 * The threads of the hub, each the loop of an amt_worker_st. They leave when their line is lost, and all but
 * the app's end the process then, with status 0.
 */

/*
 * Serves the test station: reads what it sends, completes the USB-insert handshake, dispatches packets and
 * answers AT text. Leaves when the port is lost or an answer cannot be sent.
 */
void amt_handle_read_pc_loop();

/*
 * Passes what the modem says to the PC, chunk by chunk as read; finishes the identity writes that the PC
 * reader has captured, and drives the handshake. Leaves when the PC port takes no more.
 */
void amt_handle_read_modem_loop();

/*
 * Serves the on-device test app through the pseudo-terminal, which it reopens when the app goes away. Its end
 * does not end the process.
 */
void amt_handle_read_app_loop();

/*
 * Follows the USB link by the kernel's device events. Leaves when the link is disconnected on a start that was
 * not USB-inserted.
 */
void amt_handle_monitor_usb_loop();

/* What the threads that read a line share. */

/*
 * Waits for one read from the line, behind what the buffer holds, and adds it to that (logged under the
 * title). The buffer takes AMT_HELD_SIZE bytes. Returns what read(2) returns.
 */
ssize_t amt_reader_read(int fd, amt_buf_st *buf_ptr, const char *title);

/* A read that brought nothing is logged with this text, and not tried again at once. */
void amt_reader_rest(const char *text, uint32_t pause_ms);

/* Whether the PC path's two lines are open. */
bool amt_reader_is_pc_path_open();

/* The end of a reader of the PC path: its line is closed, and the process ends with status 0. */
[[noreturn]] void amt_reader_end(std::atomic<int> *fd_ptr, amt_worker_st *worker_ptr);
