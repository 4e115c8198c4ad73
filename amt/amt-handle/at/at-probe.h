#pragma once

/*
 * Looks for the station's bare "AT" probe in the held request. A probe on a serial modem sets the modem's
 * line for AT use; and it is replaced by a command that switches the modem's link reports on too, whose "OK"
 * answers the probe.
 */
void amt_at_probe_rewrite();
