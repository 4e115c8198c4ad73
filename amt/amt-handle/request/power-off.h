#pragma once

/*
 * Powers the handset off: a pause of 2 seconds, in which the answer that announced it reaches the station,
 * then the reboot system call with its power-off command. Returns only when the system refuses, which is
 * logged.
 */
void amt_power_off_handset();
