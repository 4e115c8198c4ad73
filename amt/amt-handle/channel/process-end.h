#pragma once

/*
 * How the process ends, whatever thread decides it and however many decide at once: one thread becomes the
 * ender, shuts the hub down and ends the process; the others wait for that. Everything here may be called
 * from a signal handler.
 */

/*
 * Makes the calling thread the ender, who will leave with this exit status. Does not return when another
 * thread is the ender already. From here on SIGUSR1 and the terminating signals no longer reach this thread,
 * and should the shut-down get stuck (a fault may have come in the middle of an allocation), the process ends
 * all the same within a second.
 *
 * A child of the service ends here at once: nothing that would be shut down is its own.
 */
void amt_process_end_begin(int exit_status);

/* Ends the process with the status given to amt_process_end_begin. */
[[noreturn]] void amt_process_end_finish();

/* The whole of it, with status 0: begin, amt_handle_deinit, finish. */
[[noreturn]] void amt_process_end();
