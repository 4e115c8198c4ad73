#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/* Room for a radio's address: 59 characters and the terminator. */
constexpr uint32_t AMT_RADIO_ADDRESS_SIZE = 60;

/*
 * Takes the address in a string atom into address_a (AMT_RADIO_ADDRESS_SIZE bytes), zeroed first and always
 * terminated; what does not fit is cut. Returns the characters taken, 0 for a missing atom; zero bytes of the
 * text's own count as such.
 */
uint32_t amt_radio_address_get(const amt_buf_st *req_ptr, uint8_t atom_id, char *address_a);
