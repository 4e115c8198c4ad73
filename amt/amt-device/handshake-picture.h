#pragma once

#include <atomic>
#include <pthread.h>

/*
 * The thread that shows the operator that the handset has entered the test mode: prepares the display, waits
 * 3 s, shows the picture and ends; the picture stays on the screen. When the preparation failed, nothing is
 * drawn.
 */

/*
 * The running picture thread, 0 when there is none. The thread itself writes both, so whoever creates it must
 * not store the id again: a thread that has ended already would look alive for ever.
 */
extern std::atomic<pthread_t> g_handshake_picture_thread;

/* The thread's body, for pthread_create (detached). Nothing of its argument is used; returns null. */
void *amt_handle_load_image_for_handshake(void *argument);
