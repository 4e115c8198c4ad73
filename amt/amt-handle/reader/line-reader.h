#pragma once

#include <stdint.h>
#include <sys/types.h>

#include "amt/amt-buf.h"
#include "amt/amt-handle/channel/worker.h"

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
