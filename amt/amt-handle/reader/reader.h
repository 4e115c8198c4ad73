#pragma once

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
