#pragma once

/* The picture that shows the operator that the handset has entered the test mode. */

/*
 * The body of the thread that brings it on the screen, for pthread_create (detached), once a handshake:
 * prepares the display, waits 3 s, shows the picture and ends; the picture stays on the screen. When the
 * preparation failed, which the log tells, nothing is drawn. Nothing of its argument is used; returns null.
 *
 * The thread shares nothing with the others; two of them must not run at once. The framebuffer's mapping and
 * the unpacked picture stay as long as the process lives.
 */
void *amt_handle_load_image_for_handshake(void *argument);
