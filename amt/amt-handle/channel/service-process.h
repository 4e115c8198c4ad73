#pragma once

/*
 * Which process serves the lines. A request may fork the service (the Bluetooth start does), and its child
 * returns through the handler into the reader loop like the parent; but only one process may ever read a
 * line. Whoever is about to read from one, or to clear up what the service owns, asks here first and, in a
 * child, ends with _exit.
 */

/* Marks the calling process as the service's own. Called once at start-up, before any other thread exists. */
void amt_service_process_mark();

/*
 * Whether the caller runs in the service's own process. True as well when none has been marked. Cheap, and
 * callable from a signal handler.
 */
bool amt_service_process_is_own();
