#pragma once

/*
 * Serves the held request as AT text: answers the commands that are the daemon's own and writes anything else
 * to the modem unchanged. Returns 0, -101 (empty request, or a command without its operands: the station gets
 * an error packet, not an AT reply), or the status of the reply or of the write.
 */
int handle_amt_pc_req_at();
