#pragma once

#include "amt/amt-handle/channel/worker.h"

/*
 * How signals reach the daemon. The main thread does nothing but take them, from the process's first moment
 * on; the start-up runs on a thread of its own, the starter. There are two reasons:
 *
 * - A shell command (pub_util_run_shell) has SIGINT ignored in the whole process while it runs, on whatever
 *   thread. The main thread has it blocked and waits for it with sigtimedwait, and the kernel keeps an ignored
 *   signal for a thread that does. No handler could take it.
 * - The main thread holds no lock and is in nobody's middle when it ends the process, whatever the others do.
 *
 * All other threads have the signals open, and so have the commands they start; what reaches one of them, sent
 * or met, is handed to the main thread. A thread that has met a fault stays where it is.
 */

/*
 * Makes dispositions and mask the daemon's own: what the starting program ignored or blocked means nothing
 * here. SIGINT, SIGTERM, SIGSEGV, SIGBUS and signal 12 end the process, SIGUSR1 ends workers, SIGPIPE only
 * makes a write fail. Called by the main thread, before any other exists.
 */
void amt_signal_prepare();

/*
 * The rest of the main thread's life: ends the process when a signal says so. starter_ptr is stopped first
 * then, if it still runs.
 */
[[noreturn]] void amt_signal_take(amt_worker_st *starter_ptr);

/*
 * For the starter, before its first shell command: waits until the main thread waits for signals. If one that
 * ends the process was sent before, this call does not return.
 */
void amt_signal_await_taker();

/*
 * For the starter: waits until the main thread has looked at the signals sent so far. If there was one that
 * ends the process, this call does not return.
 */
void amt_signal_settle();

/* Shuts the hub down, for whichever thread ends the process; logs its own name. */
void amt_deinit_resource();
