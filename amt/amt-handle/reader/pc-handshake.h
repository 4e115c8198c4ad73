#pragma once

/*
 * The station's side of the USB-insert handshake: data from the PC. The first data prove that the link is up;
 * data while the handshake timer runs complete the handshake, start the picture for the operator and set USB
 * charging. Nothing happens on a start that was not USB-inserted.
 */
void amt_pc_handshake_on_data();
