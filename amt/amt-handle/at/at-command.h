#pragma once

/*
 * What the PC says that is no packet of a local handler: AT text, and all that goes to the modem. Each works
 * on the held request, on the PC reader's thread.
 */

/*
 * Looks for the station's bare "AT" probe. A probe on a serial modem sets the modem's line for AT use; and it
 * is replaced by a command that switches the modem's link reports on too, whose "OK" answers the probe.
 */
void amt_at_probe_rewrite();

/*
 * Serves the request as AT text: answers the commands that are the daemon's own and writes anything else to
 * the modem unchanged. Returns 0, PUB_ERR_PARAM (empty request, or a command without its operands: the station
 * gets an error packet, not an AT reply), or the status of the reply or of the write.
 */
int handle_amt_pc_req_at();

/*
 * Writes the request to the modem data tty, unchanged, in one write. A lost tty (EIO, EBADF) is reopened; the
 * request is not written again. Returns 0, PUB_ERR_FAIL (short or failed write), or the error of the
 * reopening.
 */
int amt_modem_write_request();
