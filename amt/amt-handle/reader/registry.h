#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"
#include "amt/amt-handle/channel/context.h"

/* The handler tables: one a channel. */
constexpr int AMT_TABLE_PC = 1;
constexpr int AMT_TABLE_APP = 2;

/*
 * Puts the handler into the slot of the command id, replacing what is there; a null handler clears the slot.
 * table 1 is the PC's, any other value the app's; ack tells who acknowledges the PC's request. Requires that
 * no reader runs. Returns 0, or PUB_ERR_PARAM for an id above 254.
 */
int amt_handle_reg_handle_func(int table, uint32_t id, amt_handle_func handler,
                               amt_ack_en ack = amt_ack_en::DISPATCHER);

/* Fills both tables: the PC's, then the app's, each in the order of its list. */
void amt_handle_register_all();
