#pragma once

/*
 * How the process ends, whatever thread decides it and however many decide at once: one thread becomes the
 * ender, shuts the hub down and ends the process; the others wait for that. Everything here may be called
 * from a signal handler.
 */

/* What the ender has to do between begin and finish. Set at start-up, before a thread can end the process. */
void amt_process_end_set_shut_down(int (*shut_down)());

/*
 * Makes the calling thread the ender, who will leave with this exit status. Does not return when another
 * thread is the ender already. From here on SIGUSR1 and the terminating signals no longer reach this thread,
 * and should the rest get stuck, in the log as well as in the shut-down, the process ends all the same within
 * a second. So this comes before anything is logged. Leaves errno as it was.
 *
 * A child of the service ends here at once: nothing that would be shut down is its own.
 */
void amt_process_end_begin(int exit_status);

/* Whether some thread is the ender. */
bool amt_process_end_has_begun();

/*
 * For a thread that cannot go on because of a fault: the ender leaves at once, with its status, for what met
 * a fault cannot be trusted to be shut down; any other thread stays here until the process has ended.
 */
[[noreturn]] void amt_process_end_by_fault();

/* Ends the process with the status given to amt_process_end_begin. */
[[noreturn]] void amt_process_end_finish();

/* The whole of it, with status 0: begin, shut down, finish. */
[[noreturn]] void amt_process_end();

/*
 * Which process serves the lines. A request may fork the service (the Bluetooth start does), and its child
 * returns through the handler into the reader loop like the parent; but only one process may ever read a
 * line. Whoever is about to read from one, or to clear up what the service owns, asks here first and, in a
 * child, ends with _exit.
 */

/* Marks the calling process as the service's own. Called once at start-up, before any other thread exists. */
void amt_service_process_mark();

/*
 * Whether the caller runs in the service's own process. True as well when none has been marked. Asks the
 * kernel, so that a signal handler, too, may ask at any moment.
 */
bool amt_service_process_is_own();

/*
 * The opposite, for who has come back from a request that may have forked: without a system call. Not for a
 * signal handler, which may interrupt a child that does not know yet that it is one.
 */
bool amt_service_process_is_child();
