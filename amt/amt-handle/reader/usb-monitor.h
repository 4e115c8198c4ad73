#pragma once

/*
 * The thread that follows the USB link by the kernel's device events. On a start that was not USB-inserted, a
 * disconnected link ends the process with status 0.
 */
void amt_handle_monitor_usb_loop();
