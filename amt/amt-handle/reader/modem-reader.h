#pragma once

/*
 * The thread that passes what the modem says to the PC, chunk by chunk as read; finishes the identity writes
 * that the PC reader has captured, and arms the handshake timer of a USB-inserted start. Ends the process
 * with status 0 when the PC port takes no more.
 */
void amt_handle_read_modem_loop();
