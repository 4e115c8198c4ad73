#pragma once

/*
 * Starts the hub: handshake permission, factory folders, handler tables, then one of the two paths with its
 * channels and threads. normal_mode is 1 when the full platform runs, else 0. Requires the configuration
 * (amt_cfg_init) and g_usb_activate. Returns 0 or a negative code; on failure nothing is left open but the
 * hub still wants its deinit.
 */
int amt_handle_init(int normal_mode);

/*
 * Shuts the hub down: stops the workers, closes the channels, removes the app's link, deletes the timers.
 * Runs once; a second call returns 0 at once. May be called from a signal handler and from any thread.
 */
int amt_handle_deinit();
