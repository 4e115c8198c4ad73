#pragma once

/*
 * The thread that serves the on-device test app through the pseudo-terminal, which it reopens when the app
 * goes away. Its end does not end the process.
 */
void amt_handle_read_app_loop();
