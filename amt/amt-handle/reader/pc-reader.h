#pragma once

/*
 * The thread that serves the test station: reads what it sends, completes the USB-insert handshake,
 * dispatches packets and answers AT text. Ends the process with status 0 when the port is lost or an answer
 * cannot be sent.
 */
void amt_handle_read_pc_loop();
