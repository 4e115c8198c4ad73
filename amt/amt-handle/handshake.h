#pragma once

/*
 * The handshake of a USB-inserted start: the link must be configured within 20 s, the station must send data
 * within 5 s of the modem's first words, and neither AC power nor the permission file may forbid it. A start
 * that was not USB-inserted (g_usb_activate is 0) has none; everything below may be called all the same.
 *
 * The state is this module's own, under one lock: what one event does is done before the next one looks. Each
 * event may come from any thread; an event never waits for anything but that lock.
 */

/*
 * Start-up's question whether a USB-inserted start may enter test mode; forgets every earlier handshake.
 * Returns 0, or PUB_ERR_FAIL after amt_handle_exit_by_handshake, when AC power or the permission file forbids
 * it. A missing file permits.
 */
int amt_handshake_ask_permission();

/* The PC path begins: the link's time runs from here. */
void amt_handshake_begin();

/* The USB link is configured, or it is not any more. */
void amt_handshake_link_up();
void amt_handshake_link_down();

/*
 * The modem has said something. The platform's state file tells whether the link was configured before
 * anybody listened; over a link that is up, the station's time begins to run.
 */
void amt_handshake_modem_data();

/*
 * The station has sent data: the link is up, whoever noticed, and data while the station's time runs complete
 * the handshake. Returns whether that has just happened; the caller shows it then (amt_handshake_show_success).
 */
bool amt_handshake_pc_data();

/* Starts the picture for the operator, on a thread of its own, and sets USB charging by the mode. */
void amt_handshake_show_success();

/* Ends the daemon because the handshake failed: failure property, timers, SIGTERM to the own process. */
void amt_handle_exit_by_handshake();

/*
 * The daemon ends: nothing is timed any more, and the property tells the platform why a USB-inserted start has
 * ended, unless it does already. May be called from a signal handler.
 */
void amt_handshake_end();
