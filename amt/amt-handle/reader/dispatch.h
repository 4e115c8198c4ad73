#pragma once

#include <stdint.h>

/* The id of a PC request that is not a packet. */
constexpr uint32_t AMT_ID_NO_PACKET = 255;

/*
 * Serves the app's request in the shared buffer: calls its handler, or answers with an error packet. The
 * buffer is cleared, unless it was empty or the error packet could not be sent.
 */
void handle_amt_app_req();

/*
 * Serves the PC's request in the shared buffer as far as a handler does: strips the envelope, acknowledges,
 * calls the handler. *id_ptr gets the command id, AMT_ID_NO_PACKET when it is no packet. Returns the
 * handler's status, PUB_ERR_NOT_FOUND when there is none. The request stays in the buffer.
 */
int handle_amt_pc_req(uint32_t *id_ptr);
